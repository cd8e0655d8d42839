#include "SimulatedInstrument.h"

#include <algorithm>
#include <new>
#include <utility>

#include "Completions.h"
#include "Descriptors.h"
#include "Platform/Threads.h"

namespace Varnholt::Simulator {

using Platform::ErrorCode;
using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;
namespace Errors = Platform::Errors;

namespace {

constexpr std::size_t BulkOut = 0;
constexpr std::size_t BulkIn = 1;
constexpr std::size_t InterruptIn = 2;
constexpr std::uint64_t NanosecondsPerSecond = 1'000'000'000;
constexpr std::uint64_t NanosecondsPerMicrosecond = 1000;
constexpr std::uint64_t MicrosecondsPerMillisecond = 1000;
constexpr std::uint8_t ButtonReport = 1;

std::uint64_t InMicroseconds(std::uint64_t nanoseconds) {
    return (nanoseconds + NanosecondsPerMicrosecond - 1) / NanosecondsPerMicrosecond;
}

}  // namespace

SimulatedInstrument::SimulatedInstrument(Platform::EventScheduler& eventScheduler,
                                         InstrumentSettings instrumentSettings)
    : settings_(std::move(instrumentSettings)),
      scheduler_(eventScheduler),
      timed_(settings_.bytesPerSecond != 0 || settings_.takesIntegrationTime),
      commands_(settings_),
      dataAlarm_(scheduler_, [this] { Do([](std::uint64_t, Completions&) {}); }),
      buttonAlarm_(scheduler_, [this] { PressButton(); }) {}

SimulatedInstrument::~SimulatedInstrument() {
    Unplug();
    WaitForClients();
}

void SimulatedInstrument::WaitForClients() const {
    // In terms of the platform, whose clock may have to let the other thread run.
    while (completing_ != 0) {
        Platform::SleepMilliseconds(1);
    }
}

SimulatedInstrument::Endpoint* SimulatedInstrument::FindEndpoint(std::uint8_t address) {
    const auto found =
        std::ranges::find(Simulator::Endpoints, address, &Platform::Usb::EndpointInfo::address);
    return found == Simulator::Endpoints.end()
               ? nullptr
               : &endpoints_[static_cast<std::size_t>(found - Simulator::Endpoints.begin())];
}

template <class Change>
void SimulatedInstrument::Do(Change change) {
    const std::uint64_t now = timed_ ? scheduler_.Now() * NanosecondsPerMicrosecond : 0;
    Completions done(completing_);
    std::uint64_t ringAt = Never;
    bool memoryChanged = false;
    {
        const std::lock_guard lock(mutex_);
        change(now, done);
        ServeBulkOut(done);
        ServeBulkIn(now, done);
        ServeInterrupt(done);
        ringAt = nextDataAt_;
        memoryChanged = std::exchange(eepromChanged_, false);
    }
    if (memoryChanged && settings_.memoryChanged) {
        settings_.memoryChanged();
    }
    if (ringAt != Never) {
        dataAlarm_.RingNoLaterThan(InMicroseconds(ringAt));
    }
    done.Deliver();
}

/// One opening of the instrument.
class SimulatedInstrument::Connection final : public Platform::Usb::UsbDevice {
  public:
    Connection(std::shared_ptr<SimulatedInstrument> connected, std::uint64_t connectedAt)
        : instrument_(std::move(connected)), plugging_(connectedAt) {}
    ~Connection() override;

    std::vector<Platform::Usb::EndpointInfo> Endpoints(ErrorCode& error) override {
        error = Errors::Success;
        return {Simulator::Endpoints.begin(), Simulator::Endpoints.end()};
    }
    ErrorCode Claim() override;
    void Release() override;
    ErrorCode Submit(Transfer& transfer) override;
    void Cancel(Transfer& transfer) override;
    ErrorCode ClearHalt(std::uint8_t address) override;

  private:
    /// With the instrument's lock held.
    bool IsAttached() const { return instrument_->pluggedIn_ && instrument_->plugging_ == plugging_; }

    const std::shared_ptr<SimulatedInstrument> instrument_;
    const std::uint64_t plugging_;  ///< of the instrument, when the connection was made
};

std::shared_ptr<Platform::Usb::UsbDevice> SimulatedInstrument::Connect(
    const std::shared_ptr<SimulatedInstrument>& instrument) {
    const std::lock_guard lock(instrument->mutex_);
    return std::make_shared<Connection>(instrument, instrument->plugging_);
}

SimulatedInstrument::Connection::~Connection() {
    Release();
    instrument_->Do([this](std::uint64_t, Completions& done) {
        for (Endpoint& endpoint : instrument_->endpoints_) {
            std::erase_if(endpoint.queue, [&](const Pending& pending) {
                if (pending.owner == this) {
                    done.Add(*pending.transfer, TransferStatus::Cancelled, 0);
                }
                return pending.owner == this;
            });
        }
    });
    instrument_->WaitForClients();
}

ErrorCode SimulatedInstrument::Connection::Claim() {
    SimulatedInstrument& instrument = *instrument_;
    {
        const std::lock_guard lock(instrument.mutex_);
        if (!IsAttached()) {
            return Errors::DeviceNotConnected;
        }
        if (instrument.claimedBy_) {
            return Errors::Busy;
        }
        instrument.claimedBy_ = this;
        instrument.configuration_ = ConfigurationValue;
    }
    if (const auto delay = instrument.settings_.buttonAfterMilliseconds) {
        instrument.buttonAlarm_.RingNoLaterThan(instrument.scheduler_.Now() +
                                                *delay * MicrosecondsPerMillisecond);
    }
    return Errors::Success;
}

void SimulatedInstrument::Connection::Release() {
    {
        const std::lock_guard lock(instrument_->mutex_);
        if (instrument_->claimedBy_ != this) {
            return;
        }
        instrument_->claimedBy_ = nullptr;
    }
    instrument_->buttonAlarm_.Clear();
}

ErrorCode SimulatedInstrument::Connection::Submit(Transfer& transfer) try {
    ErrorCode code = Errors::Success;
    instrument_->Do([&](std::uint64_t now, Completions& done) {
        Endpoint* const endpoint = instrument_->FindEndpoint(transfer.endpoint);
        if (!IsAttached()) {
            code = Errors::DeviceNotConnected;
        } else if (transfer.endpoint == 0) {
            instrument_->Control(transfer, now, done);
        } else if (!endpoint) {
            code = Errors::InvalidParameter;
        } else if (endpoint->halted) {
            done.Add(transfer, TransferStatus::Stalled, 0);
        } else {
            endpoint->queue.push_back({&transfer, this, now});
        }
    });
    return code;
} catch (const std::bad_alloc&) {
    return Errors::NotEnoughMemory;
}

void SimulatedInstrument::Connection::Cancel(Transfer& transfer) {
    instrument_->Do([&](std::uint64_t now, Completions& done) {
        for (Endpoint& endpoint : instrument_->endpoints_) {
            const auto pending = std::ranges::find(endpoint.queue, &transfer, &Pending::transfer);
            if (pending == endpoint.queue.end()) {
                continue;
            }
            const bool moves =
                &endpoint == &instrument_->endpoints_[BulkIn] && pending == endpoint.queue.begin();
            const std::uint32_t moved = moves ? instrument_->TakeWhatMoved(*pending, now) : 0;
            endpoint.queue.erase(pending);
            done.Add(transfer, TransferStatus::Cancelled, moved);
        }
    });
}

ErrorCode SimulatedInstrument::Connection::ClearHalt(std::uint8_t address) {
    const std::lock_guard lock(instrument_->mutex_);
    if (!IsAttached()) {
        return Errors::DeviceNotConnected;
    }
    Endpoint* const endpoint = instrument_->FindEndpoint(address);
    if (!endpoint) {
        return Errors::InvalidParameter;
    }
    endpoint->halted = false;
    return Errors::Success;
}

void SimulatedInstrument::Unplug() {
    buttonAlarm_.Clear();
    Do([this](std::uint64_t, Completions& done) {
        pluggedIn_ = false;
        claimedBy_ = nullptr;
        configuration_ = 0;
        buttonReportWaits_ = false;
        commands_.PowerOff();
        for (Endpoint& endpoint : endpoints_) {
            endpoint.halted = false;
            EndAll(endpoint, TransferStatus::DeviceGone, done);
        }
    });
    dataAlarm_.Clear();  // the clock may be another when the next data are waited for
}

void SimulatedInstrument::PlugIn() {
    const std::lock_guard lock(mutex_);
    if (!pluggedIn_) {
        pluggedIn_ = true;
        ++plugging_;
    }
}

bool SimulatedInstrument::PluggedIn() const {
    const std::lock_guard lock(mutex_);
    return pluggedIn_;
}

bool SimulatedInstrument::Claimed() const {
    const std::lock_guard lock(mutex_);
    return claimedBy_ != nullptr;
}

std::size_t SimulatedInstrument::PendingTransfers() const {
    const std::lock_guard lock(mutex_);
    std::size_t count = 0;
    for (const Endpoint& endpoint : endpoints_) {
        count += endpoint.queue.size();
    }
    return count;
}

void SimulatedInstrument::PressButton() {
    Do([this](std::uint64_t, Completions&) { buttonReportWaits_ = pluggedIn_; });
}

void SimulatedInstrument::EndAll(Endpoint& endpoint, TransferStatus status, Completions& done) {
    for (const Pending& pending : endpoint.queue) {
        done.Add(*pending.transfer, status, 0);
    }
    endpoint.queue.clear();
}

void SimulatedInstrument::Halt(Endpoint& endpoint, Completions& done) {
    endpoint.halted = true;
    EndAll(endpoint, TransferStatus::Stalled, done);
}

void SimulatedInstrument::ServeBulkOut(Completions& done) {
    Endpoint& out = endpoints_[BulkOut];
    while (!out.queue.empty()) {
        Transfer& transfer = *out.queue.front().transfer;
        if (transfer.length > 0) {
            MemoryWrite& write = commands_.Write();
            if (!write.Active()) {
                return;
            }
            switch (write.Take({transfer.data, transfer.length})) {
                case MemoryWrite::Outcome::Refused:
                    Halt(out, done);
                    return;
                case MemoryWrite::Outcome::Changed:
                    eepromChanged_ = true;
                    break;
                case MemoryWrite::Outcome::Taken:
                    break;
            }
        }
        done.Add(transfer, TransferStatus::Completed, transfer.length);
        out.queue.erase(out.queue.begin());
    }
}

std::uint64_t SimulatedInstrument::Duration(std::uint64_t bytes) const {
    return settings_.bytesPerSecond == 0 ? 0 : bytes * NanosecondsPerSecond / settings_.bytesPerSecond;
}

std::uint64_t SimulatedInstrument::Begin(const Pending& pending) const {
    return std::max({pending.since, answersFrom_, lineFreeFrom_});
}

void SimulatedInstrument::ServeBulkIn(std::uint64_t now, Completions& done) {
    nextDataAt_ = Never;
    AnswerStream& answers = commands_.Answers();
    Endpoint& in = endpoints_[BulkIn];
    while (!in.queue.empty()) {
        const Pending pending = in.queue.front();
        Transfer& transfer = *pending.transfer;
        std::uint32_t moved = 0;
        if (transfer.length > 0) {
            if (!answers.Active()) {
                return;
            }
            if (timed_) {
                const auto size = std::min<std::uint64_t>(transfer.length, answers.Remaining());
                const std::uint64_t end = Begin(pending) + Duration(size);
                if (end > now) {
                    nextDataAt_ = end;
                    return;
                }
                lineFreeFrom_ = end;
            }
            moved = answers.Take(transfer.data, transfer.length);
        }
        done.Add(transfer, TransferStatus::Completed, moved);
        in.queue.erase(in.queue.begin());
    }
}

std::uint32_t SimulatedInstrument::TakeWhatMoved(const Pending& pending, std::uint64_t now) {
    AnswerStream& answers = commands_.Answers();
    const std::uint64_t begin = Begin(pending);
    const auto size = std::min<std::uint64_t>(pending.transfer->length, answers.Remaining());
    if (settings_.bytesPerSecond == 0 || size == 0 || now <= begin) {
        return 0;
    }
    const double seconds = static_cast<double>(now - begin) / static_cast<double>(NanosecondsPerSecond);
    const double packets = seconds * static_cast<double>(settings_.bytesPerSecond) / BulkPacketSize;
    const std::uint64_t most = (size - 1) / BulkPacketSize;
    const auto whole = packets < static_cast<double>(most) ? static_cast<std::uint64_t>(packets) : most;
    if (whole == 0) {
        return 0;
    }
    lineFreeFrom_ = now;
    return answers.Take(pending.transfer->data, static_cast<std::uint32_t>(whole * BulkPacketSize));
}

void SimulatedInstrument::ServeInterrupt(Completions& done) {
    Endpoint& interrupt = endpoints_[InterruptIn];
    if (!buttonReportWaits_ || interrupt.queue.empty()) {
        return;
    }
    Transfer& transfer = *interrupt.queue.front().transfer;
    interrupt.queue.erase(interrupt.queue.begin());
    if (transfer.length == 0) {
        done.Add(transfer, TransferStatus::Overflow, 0);
        return;
    }
    buttonReportWaits_ = false;
    transfer.data[0] = ButtonReport;
    done.Add(transfer, TransferStatus::Completed, 1);
}

std::vector<std::uint8_t> SimulatedInstrument::Eeprom() {
    return WithCommands([](const Commands& state) { return state.eeprom; });
}

void SimulatedInstrument::SetEeprom(const std::vector<std::uint8_t>& content) {
    WithCommands([&](Commands& state) {
        std::copy_n(content.begin(), std::min(content.size(), state.eeprom.size()), state.eeprom.begin());
    });
}

}  // namespace Varnholt::Simulator
