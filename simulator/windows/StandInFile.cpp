#include "StandInFile.h"

#include <algorithm>
#include <atomic>
#include <cstring>
#include <stdexcept>
#include <utility>
#include <vector>

#include "KernelStatus.h"
#include "Platform/EventScheduler.h"
#include "TestControls.h"

namespace Varnholt::Simulator {

using Platform::Operation;
using Platform::Drivers::Decision;

/// A request on its way. Kept alive by the file while it runs, and by whoever cancels it.
class StandInFileObject::Running final : public Platform::Usb::TransferClient {
  public:
    Running(std::shared_ptr<StandInFileObject> owner, const StandInRequest& driversRequest)
        : file(std::move(owner)), request(driversRequest) {
        transfer.client = this;
    }

    void TransferCompleted(Platform::Usb::Transfer& completed) noexcept override {
        if (completed.status == Platform::Usb::TransferStatus::Cancelled &&
            file->instrument_->IsUnplugged()) {
            completed.status = Platform::Usb::TransferStatus::DeviceGone;
        }
        file->driver_->Device().Learn(completed);
        const bool wasGivenUp = givenUp && completed.status == Platform::Usb::TransferStatus::Cancelled;
        file->Ended(*this, KernelStatus(wasGivenUp ? file->driver_->TimedOutCode()
                                                   : file->driver_->OutcomeOf(completed.status)));
    }

    Platform::Usb::Transfer transfer;
    std::atomic<bool> givenUp = false;  ///< the driver cancels it because its time is over
    const std::shared_ptr<StandInFileObject> file;
    const StandInRequest request;
};

Status StandInFileObject::Start(const Operation& operation, const StandInRequest& request,
                                unsigned long& bytes) {
    if (const auto status = TestControl(operation, bytes)) {
        return *status;
    }
    // With the buffered method, a control's input and output are one buffer.
    const std::vector<std::uint8_t> copiedInput(operation.input.begin(), operation.input.end());
    Operation copied = operation;
    copied.input = copiedInput;
    const auto running = std::make_shared<Running>(shared_from_this(), request);
    const Decision decision = driver_->Decide(copied, running->transfer);
    bytes = decision.bytes;
    if (decision.kind != Decision::Kind::Send) {
        return KernelStatus(decision.code);
    }
    {
        const std::lock_guard held(lock_);
        requests_.emplace(running->request.number, running);
    }
    LimitTime(running);
    running->request.pending(running->request.packet);
    const Platform::ErrorCode refusal = driver_->Device().Submit(running->transfer);
    if (refusal != Platform::Errors::Success) {
        running->transfer.actualLength = 0;
        Ended(*running, KernelStatus(driver_->RefusalOf(refusal)));
    }
    return StatusPending;
}

void StandInFileObject::LimitTime(const std::shared_ptr<Running>& running) {
    const std::uint32_t limit = driver_->TimeLimitOf(running->transfer);
    if (limit == 0) {
        return;
    }
    auto& scheduler = Platform::ClockScheduler();
    const auto giveUp = [given = std::weak_ptr(running)] {
        if (const auto late = given.lock()) {
            late->givenUp = true;
            late->file->driver_->Device().Cancel(late->transfer);
        }
    };
    scheduler.CallAt(scheduler.Now() + std::uint64_t{limit} * 1000, giveUp);
}

void StandInFileObject::Ended(Running& running, Status status) {
    std::shared_ptr<Running> keptToTheEnd;
    {
        const std::lock_guard held(lock_);
        const auto found = requests_.find(running.request.number);
        keptToTheEnd = std::move(found->second);
        requests_.erase(found);
    }
    running.request.completed(running.request.packet, status, running.transfer.actualLength);
}

template <class Matches>
void StandInFileObject::CancelThose(Matches matches) {
    std::vector<std::shared_ptr<Running>> found;
    {
        const std::lock_guard held(lock_);
        for (const auto& [number, running] : requests_) {
            if (matches(*running)) {
                found.push_back(running);
            }
        }
    }
    for (const auto& running : found) {
        driver_->Device().Cancel(running->transfer);
    }
}

void StandInFileObject::Cancel(unsigned long requestNumber) {
    CancelThose([requestNumber](const Running& running) { return running.request.number == requestNumber; });
}

void StandInFileObject::CancelEndpoint(std::uint8_t endpoint) {
    CancelThose([endpoint](const Running& running) { return running.transfer.endpoint == endpoint; });
}

void StandInFileObject::CancelAll() {
    CancelThose([](const Running&) { return true; });
}

std::optional<Status> StandInFileObject::TestControl(const Operation& operation, unsigned long& bytes) {
    SimulatedInstrument& simulated = instrument_->Simulated();
    const auto& input = operation.input;
    const auto answer = [&](const void* data, std::size_t size) {
        bytes = static_cast<unsigned long>(std::min<std::size_t>(size, operation.length));
        std::memcpy(operation.data, data, bytes);
    };
    bytes = 0;
    switch (operation.code) {
        case TestControls::PressButton:
            simulated.PressButton();
            break;
        case TestControls::SetFaults:
            try {
                instrument_->SetFaults(std::string(input.begin(), input.end()));
            } catch (const std::invalid_argument&) {
                return KernelStatus(Platform::Errors::InvalidParameter);
            }
            break;
        case TestControls::UseElsewhere:
            instrument_->UseElsewhere();
            break;
        case TestControls::ReadEeprom: {
            const std::vector<std::uint8_t> content = simulated.Eeprom();
            answer(content.data(), content.size());
            break;
        }
        case TestControls::TakeTranscript: {
            const std::string transcript = StandInInstrumentObject::TakeTranscript();
            answer(transcript.data(), transcript.size());
            break;
        }
        case TestControls::ReadCounts: {
            auto counts = simulated.WithCommands([](const Commands& commands) {
                return TestControls::Counts{static_cast<std::uint32_t>(commands.measurements),
                                            static_cast<std::uint32_t>(commands.resets),
                                            static_cast<std::uint32_t>(commands.buttonReports), 0, 0};
            });
            counts.openFiles = static_cast<std::uint32_t>(instrument_->OpenFiles());
            counts.pendingTransfers = static_cast<std::uint32_t>(simulated.PendingTransfers());
            answer(&counts, sizeof counts);
            break;
        }
        default:
            return std::nullopt;
    }
    return KernelStatus(Platform::Errors::Success);
}

}  // namespace Varnholt::Simulator
