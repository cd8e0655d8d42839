#include "FaultInjector.h"

#include <algorithm>
#include <map>
#include <mutex>
#include <new>
#include <set>
#include <utility>
#include <vector>

#include "DataFaults.h"
#include "Passage.h"

namespace Varnholt::Simulator {

using Platform::ErrorCode;
using Platform::Usb::EndpointInfo;
using Platform::Usb::Transfer;
using Platform::Usb::TransferClient;
using Platform::Usb::TransferStatus;
using Platform::Usb::UsbDevice;
namespace Errors = Platform::Errors;

namespace {

/// Milliseconds: no host asks an interrupt endpoint more often, so that no fault can make it answer without a
/// pause.
constexpr std::uint32_t InterruptInterval = 1;

bool IsStandardRequest(const Transfer& transfer) {
    constexpr std::uint8_t typeMask = 0x60;
    return transfer.endpoint == 0 && (transfer.setup.requestType & typeMask) == 0;
}

void Shorten(Passage& passage, std::uint32_t length) {
    passage.length = std::min(passage.length, length);
    if (passage.endpoint == 0) {
        passage.setup.length = static_cast<std::uint16_t>(passage.length);
    }
}

class FaultInjector final : public UsbDevice, private TransferClient {
  public:
    FaultInjector(std::shared_ptr<UsbDevice> behind, std::shared_ptr<FaultScript> faultScript,
                  Platform::EventScheduler& eventScheduler, std::function<void()> unplugDevice)
        : device_(std::move(behind)),
          script_(std::move(faultScript)),
          scheduler_(eventScheduler),
          unplug_(std::move(unplugDevice)),
          dataFaults_(*script_) {}
    ~FaultInjector() override;

    std::vector<EndpointInfo> Endpoints(Platform::ErrorCode& error) override {
        return device_->Endpoints(error);
    }
    ErrorCode Claim() override { return Gone() ? Errors::DeviceNotConnected : device_->Claim(); }
    void Release() override { device_->Release(); }
    ErrorCode Submit(Transfer& transfer) override;
    void Cancel(Transfer& transfer) override;
    ErrorCode ClearHalt(std::uint8_t endpoint) override;

  private:
    using EventId = Platform::EventScheduler::EventId;

    ErrorCode Begin(const PassagePointer& passage);
    ErrorCode PassOn(const PassagePointer& passage);
    bool AnswerWithLastData(const PassagePointer& passage);
    void HoldFor(const PassagePointer& passage, std::uint32_t milliseconds);
    void TimeHasCome(const PassagePointer& passage) noexcept;
    ErrorCode GoOn(const PassagePointer& passage) noexcept;
    void TransferCompleted(Transfer& transfer) noexcept override;
    void ChangeOutcome(Passage& passage);
    void UnplugDevice();
    void EndAll(TransferStatus status);

    /// Takes a transfer out of the ones under way; null when it has ended already.
    PassagePointer TakeOut(const Passage& passage);
    /// Ends a transfer unless it has ended already.
    void End(const Passage& passage, TransferStatus status, std::uint32_t actualLength);
    bool Gone();

    std::shared_ptr<UsbDevice> device_;
    const std::shared_ptr<FaultScript> script_;
    Platform::EventScheduler& scheduler_;
    const std::function<void()> unplug_;
    DataFaults dataFaults_;

    std::mutex mutex_;  // guards what follows; not held while the device, a client or the scheduler is called
    std::map<const Transfer*, PassagePointer> passages_;  // under way, by the submitter's own
    std::map<const Passage*, EventId> alarms_;
    std::set<std::uint8_t> halted_;
    bool gone_ = false;
};

FaultInjector::~FaultInjector() {
    std::map<const Passage*, EventId> waiting;
    {
        const std::lock_guard lock(mutex_);
        waiting.swap(alarms_);
    }
    for (const auto& [passage, alarm] : waiting) {
        scheduler_.Forget(alarm);
    }
    EndAll(TransferStatus::Cancelled);
    device_.reset();  // returns when what it still had has completed
}

bool FaultInjector::Gone() {
    const std::lock_guard lock(mutex_);
    return gone_;
}

ErrorCode FaultInjector::Submit(Transfer& transfer) try {
    const auto passage = std::make_shared<Passage>();
    static_cast<Transfer&>(*passage) = transfer;
    passage->client = this;
    passage->deviceData = nullptr;
    passage->original = &transfer;
    {
        const std::lock_guard lock(mutex_);
        if (gone_) {
            return Errors::DeviceNotConnected;
        }
        passages_[&transfer] = passage;
        if (!IsStandardRequest(transfer)) {
            passage->fault = script_->Next(transfer.endpoint);
        }
        if (passage->Has(FaultKind::Stall) && transfer.endpoint != 0) {
            halted_.insert(transfer.endpoint);
        } else if (halted_.contains(transfer.endpoint)) {
            passage->fault = Fault{};
            passage->fault->kind = FaultKind::Stall;
        }
    }
    const ErrorCode code = GoOn(passage);
    if (code != Errors::Success && !TakeOut(*passage)) {
        return Errors::Success;  // cancelled meanwhile
    }
    return code;
} catch (const std::bad_alloc&) {
    return Errors::NotEnoughMemory;
}

/// With any code but `Success` the passage is still under way, and the caller's to end.
ErrorCode FaultInjector::GoOn(const PassagePointer& passage) noexcept try {
    return passage->Has(FaultKind::Late) && passage->wasHeld ? PassOn(passage) : Begin(passage);
} catch (const std::bad_alloc&) {
    return Errors::NotEnoughMemory;
} catch (...) {
    return Errors::GeneralFailure;
}

ErrorCode FaultInjector::Begin(const PassagePointer& passage) {
    if (!passage->fault) {
        return PassOn(passage);
    }
    const std::optional<std::uint32_t> argument = passage->fault->argument;
    if (ScopeOfEndpoint(passage->endpoint) == FaultScope::Interrupt && !passage->Has(FaultKind::Late) &&
        !passage->wasHeld) {
        HoldFor(passage, InterruptInterval);
        return Errors::Success;
    }
    switch (passage->fault->kind) {
        case FaultKind::Stall:
            End(*passage, TransferStatus::Stalled, 0);
            return Errors::Success;
        case FaultKind::IoError:
            End(*passage, TransferStatus::IoError, 0);
            return Errors::Success;
        case FaultKind::Overflow:
            End(*passage, TransferStatus::Overflow, 0);
            return Errors::Success;
        case FaultKind::Empty:
            End(*passage, TransferStatus::Completed, 0);
            return Errors::Success;
        case FaultKind::Silent:
            return Errors::Success;
        case FaultKind::Late:
            HoldFor(passage, argument.value_or(0));
            return Errors::Success;
        case FaultKind::Short:
            Shorten(*passage, argument.value_or(passage->length / 2));
            return PassOn(passage);
        case FaultKind::Long:
            if (!passage->IsIn()) {
                End(*passage, TransferStatus::Overflow, 0);
                return Errors::Success;
            }
            return PassOn(passage);
        case FaultKind::Stale:
            if (passage->IsIn()) {
                return AnswerWithLastData(passage) ? Errors::Success : PassOn(passage);
            }
            dataFaults_.ReplaceOut(*passage);
            return PassOn(passage);
        case FaultKind::Garbage:
        case FaultKind::Flip:
            if (!passage->IsIn()) {
                dataFaults_.ReplaceOut(*passage);
            }
            return PassOn(passage);
        case FaultKind::GoneBefore: {
            const std::lock_guard lock(mutex_);
            passage->cancelWanted = true;  // the unplugging leaves it to the caller
        }
            UnplugDevice();
            return Errors::DeviceNotConnected;
        case FaultKind::GoneDuring:
            if (passage->endpoint != 0 && !passage->IsIn() && passage->length > 1) {
                Shorten(*passage, passage->length / 2);
                return PassOn(passage);
            }
            UnplugDevice();
            return Errors::Success;
        case FaultKind::LateCancel:
        case FaultKind::GoneAfter:
            break;
    }
    return PassOn(passage);
}

ErrorCode FaultInjector::PassOn(const PassagePointer& passage) {
    constexpr std::uint8_t standardRequestToEndpoint = 0x02;
    constexpr std::uint8_t clearFeature = 1;
    {
        const std::lock_guard lock(mutex_);
        const auto found = passages_.find(passage->original);
        if (found == passages_.end() || found->second != passage) {
            return Errors::Success;  // cancelled while it was held
        }
        passage->state = Passage::State::Submitting;
        if (!passage->IsIn()) {
            dataFaults_.KeepOut(*passage);
        }
        if (passage->endpoint == 0 && passage->setup.requestType == standardRequestToEndpoint &&
            passage->setup.request == clearFeature) {
            halted_.erase(static_cast<std::uint8_t>(passage->setup.index));
        }
    }
    if (const ErrorCode code = device_->Submit(*passage); code != Errors::Success) {
        return code;
    }
    {
        const std::lock_guard lock(mutex_);
        if (passage->state != Passage::State::Submitting) {
            return Errors::Success;
        }
        passage->state = Passage::State::InDevice;
        if (!passage->cancelWanted) {
            return Errors::Success;
        }
    }
    device_->Cancel(*passage);
    return Errors::Success;
}

/// False when there are none to repeat.
bool FaultInjector::AnswerWithLastData(const PassagePointer& passage) {
    const std::optional<std::uint32_t> length = dataFaults_.RepeatIn(*passage);
    if (!length) {
        return false;
    }
    End(*passage, TransferStatus::Completed, *length);
    return true;
}

void FaultInjector::HoldFor(const PassagePointer& passage, std::uint32_t milliseconds) {
    passage->wasHeld = true;
    {
        const std::lock_guard lock(mutex_);
        alarms_[passage.get()] = 0;  // first what can fail: no alarm is left that nobody knows
    }
    EventId alarm = 0;
    try {
        alarm = scheduler_.CallAt(scheduler_.Now() + std::uint64_t{milliseconds} * 1000,
                                  [this, passage] { TimeHasCome(passage); });
    } catch (...) {
        const std::lock_guard lock(mutex_);
        alarms_.erase(passage.get());
        throw;
    }
    const std::lock_guard lock(mutex_);
    if (const auto found = alarms_.find(passage.get()); found != alarms_.end()) {
        found->second = alarm;
    }
}

void FaultInjector::TimeHasCome(const PassagePointer& passage) noexcept {
    bool waiting = false;
    {
        const std::lock_guard lock(mutex_);
        const auto found = passages_.find(passage->original);
        waiting = found != passages_.end() && found->second == passage;
    }
    if (waiting) {
        const ErrorCode code = GoOn(passage);
        if (code != Errors::Success) {
            End(*passage,
                code == Errors::DeviceNotConnected ? TransferStatus::DeviceGone : TransferStatus::IoError, 0);
        }
    }
    // Known as waiting until now, so that the destructor waits for the end of this call.
    const std::lock_guard lock(mutex_);
    alarms_.erase(passage.get());
}

void FaultInjector::Cancel(Transfer& transfer) {
    PassagePointer passage;
    bool held = false;
    {
        const std::lock_guard lock(mutex_);
        const auto found = passages_.find(&transfer);
        if (found == passages_.end()) {
            return;
        }
        passage = found->second;
        passage->cancelWanted = true;
        if (passage->state == Passage::State::Submitting) {
            return;
        }
        held = passage->state != Passage::State::InDevice;
    }
    if (held) {
        End(*passage, TransferStatus::Cancelled,
            passage->state == Passage::State::HeldWithData ? passage->actualLength : 0);
    } else {
        device_->Cancel(*passage);
    }
}

ErrorCode FaultInjector::ClearHalt(std::uint8_t endpoint) {
    {
        const std::lock_guard lock(mutex_);
        if (gone_) {
            return Errors::DeviceNotConnected;
        }
        halted_.erase(endpoint);
    }
    return device_->ClearHalt(endpoint);
}

void FaultInjector::TransferCompleted(Transfer& transfer) noexcept {
    auto& passage = static_cast<Passage&>(transfer);
    const bool unplugs = passage.Has(FaultKind::GoneDuring) || passage.Has(FaultKind::GoneAfter);
    bool held = false;
    {
        const std::lock_guard lock(mutex_);
        held = passage.Has(FaultKind::LateCancel) && !passage.cancelWanted && !gone_ &&
               passage.status == TransferStatus::Completed;
        passage.state = held ? Passage::State::HeldWithData : Passage::State::InDevice;
        if (!held) {
            ChangeOutcome(passage);
        }
    }
    if (!held) {
        End(passage, passage.status, passage.actualLength);
    }
    if (unplugs) {
        UnplugDevice();
    }
}

void FaultInjector::ChangeOutcome(Passage& passage) {
    if (gone_ || passage.Has(FaultKind::GoneDuring)) {
        passage.status = TransferStatus::DeviceGone;
    } else if (passage.Has(FaultKind::LateCancel) && passage.status == TransferStatus::Completed) {
        passage.status = TransferStatus::Cancelled;
    } else if (passage.Has(FaultKind::Long) && passage.status == TransferStatus::Completed) {
        passage.status = TransferStatus::Overflow;
    }
    if (passage.IsIn()) {
        dataFaults_.ChangeIn(passage);
    }
}

void FaultInjector::UnplugDevice() {
    {
        const std::lock_guard lock(mutex_);
        if (std::exchange(gone_, true)) {
            return;
        }
    }
    if (unplug_) {
        unplug_();
    }
    EndAll(TransferStatus::DeviceGone);
}

/// Ends what is held with `status` and has the device end the rest. One at a time: this takes no memory.
void FaultInjector::EndAll(TransferStatus status) {
    while (true) {
        PassagePointer passage;
        Passage::State state{};
        {
            const std::lock_guard lock(mutex_);
            const auto found = std::ranges::find_if(
                passages_, [](const auto& underWay) { return !underWay.second->cancelWanted; });
            if (found == passages_.end()) {
                return;
            }
            passage = found->second;
            passage->cancelWanted = true;
            state = passage->state;
        }
        if (state == Passage::State::InDevice) {
            device_->Cancel(*passage);
        } else if (state != Passage::State::Submitting) {
            const bool keepsData =
                status == TransferStatus::Cancelled && state == Passage::State::HeldWithData;
            End(*passage, status, keepsData ? passage->actualLength : 0);
        }
    }
}

PassagePointer FaultInjector::TakeOut(const Passage& passage) {
    const std::lock_guard lock(mutex_);
    const auto found = passages_.find(passage.original);
    if (found == passages_.end() || found->second.get() != &passage) {
        return nullptr;
    }
    PassagePointer taken = std::move(found->second);
    passages_.erase(found);
    return taken;
}

void FaultInjector::End(const Passage& passage, TransferStatus status, std::uint32_t actualLength) {
    // Keeps the copy alive for the device that is completing it.
    const PassagePointer taken = TakeOut(passage);
    if (!taken) {
        return;
    }
    Transfer& original = *taken->original;
    original.status = status;
    original.actualLength = actualLength;
    original.client->TransferCompleted(original);
}

}  // namespace

std::shared_ptr<UsbDevice> InjectFaults(std::shared_ptr<UsbDevice> device,
                                        std::shared_ptr<FaultScript> script,
                                        Platform::EventScheduler& scheduler, std::function<void()> unplug) {
    return std::make_shared<FaultInjector>(std::move(device), std::move(script), scheduler,
                                           std::move(unplug));
}

}  // namespace Varnholt::Simulator
