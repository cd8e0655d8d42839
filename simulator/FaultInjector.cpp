#include "FaultInjector.h"

#include <algorithm>
#include <mutex>
#include <set>
#include <utility>

#include "DataFaults.h"
#include "FaultyTransfer.h"

namespace Varnholt::Simulator {

using Capture::InterceptedTransfer;
using Platform::ErrorCode;
using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;
using Platform::Usb::UsbDevice;
namespace Errors = Platform::Errors;

namespace {

/// Milliseconds: no host asks an interrupt endpoint more often, so that no fault can make it answer without a
/// pause.
constexpr std::uint32_t InterruptInterval = 1;

bool IsStandardRequest(const Transfer& transfer) {
    return transfer.endpoint == 0 && transfer.setup.IsStandard();
}

/// The endpoint that a standard request frees of its halt; 0 for every other transfer.
std::uint8_t ClearedEndpoint(const Transfer& transfer) {
    constexpr std::uint8_t standardRequestToEndpoint = 0x02;
    constexpr std::uint8_t clearFeature = 1;
    const bool clears = transfer.endpoint == 0 && transfer.setup.requestType == standardRequestToEndpoint &&
                        transfer.setup.request == clearFeature;
    return clears ? static_cast<std::uint8_t>(transfer.setup.index) : std::uint8_t{0};
}

void Shorten(FaultyTransfer& transfer, std::uint32_t length) {
    transfer.length = std::min(transfer.length, length);
    if (transfer.endpoint == 0) {
        transfer.setup.length = static_cast<std::uint16_t>(transfer.length);
    }
}

class FaultInjector final : public Capture::InterceptingDevice {
  public:
    FaultInjector(std::shared_ptr<UsbDevice> behind, std::shared_ptr<FaultScript> faultScript,
                  Platform::EventScheduler& eventScheduler, std::function<void()> unplugDevice)
        : InterceptingDevice(std::move(behind)),
          script_(std::move(faultScript)),
          scheduler_(eventScheduler),
          unplug_(std::move(unplugDevice)),
          dataFaults_(*script_) {}
    ~FaultInjector() override {
        scheduler_.Forget(this);
        Detach();
    }

    ErrorCode Claim() override { return Gone() ? Errors::DeviceNotConnected : InterceptingDevice::Claim(); }
    ErrorCode ClearHalt(std::uint8_t endpoint) override;

  private:
    using TransferPointer = std::shared_ptr<FaultyTransfer>;

    CopyPointer NewCopy() override { return std::make_shared<FaultyTransfer>(); }
    ErrorCode Start(const CopyPointer& copy) override;
    void Completed(InterceptedTransfer& copy) noexcept override;

    ErrorCode Begin(const TransferPointer& transfer);
    /// With the fault that it has; an outcome comes at once, later, or from the device.
    ErrorCode BeginWithFault(const TransferPointer& transfer);
    ErrorCode Forward(const TransferPointer& transfer);
    ErrorCode AnswerWithLastData(const TransferPointer& transfer);
    ErrorCode EndWith(const FaultyTransfer& transfer, TransferStatus status);
    /// False when the transfer's end was asked for meanwhile, and it has ended.
    bool Hold(FaultyTransfer& transfer);
    void HoldFor(const TransferPointer& transfer, std::uint32_t milliseconds);
    void TimeHasCome(const TransferPointer& transfer) noexcept;
    void ChangeOutcome(FaultyTransfer& transfer);
    void UnplugDevice(const FaultyTransfer* except = nullptr);
    bool Gone();

    const std::shared_ptr<FaultScript> script_;
    Platform::EventScheduler& scheduler_;
    const std::function<void()> unplug_;
    DataFaults dataFaults_;

    std::mutex mutex_;  // guards what follows; not held while another object is called
    std::set<std::uint8_t> halted_;
    bool gone_ = false;
};

bool FaultInjector::Gone() {
    const std::lock_guard lock(mutex_);
    return gone_;
}

ErrorCode FaultInjector::Start(const CopyPointer& copy) {
    const auto transfer = std::static_pointer_cast<FaultyTransfer>(copy);
    {
        const std::lock_guard lock(mutex_);
        if (gone_) {
            return Errors::DeviceNotConnected;
        }
        if (!IsStandardRequest(*transfer)) {
            transfer->fault = script_->Next(transfer->endpoint);
        }
        if (transfer->Has(FaultKind::Stall) && transfer->endpoint != 0) {
            halted_.insert(transfer->endpoint);
        } else if (halted_.contains(transfer->endpoint)) {
            transfer->fault = Fault{};
            transfer->fault->kind = FaultKind::Stall;
        }
    }
    return Begin(transfer);
}

ErrorCode FaultInjector::Begin(const TransferPointer& transfer) {
    if (!transfer->fault || (transfer->wasHeld && transfer->Has(FaultKind::Late))) {
        return Forward(transfer);
    }
    if (transfer->Has(FaultKind::Late)) {
        HoldFor(transfer, transfer->fault->argument.value_or(0));
        return Errors::Success;
    }
    if (transfer->endpoint == Protocol::InterruptInEndpoint && !transfer->wasHeld) {
        HoldFor(transfer, InterruptInterval);
        return Errors::Success;
    }
    return BeginWithFault(transfer);
}

ErrorCode FaultInjector::BeginWithFault(const TransferPointer& transfer) {
    switch (transfer->fault->kind) {
        case FaultKind::Stall:
            return EndWith(*transfer, TransferStatus::Stalled);
        case FaultKind::IoError:
            return EndWith(*transfer, TransferStatus::IoError);
        case FaultKind::Overflow:
            return EndWith(*transfer, TransferStatus::Overflow);
        case FaultKind::Empty:
            return EndWith(*transfer, TransferStatus::Completed);
        case FaultKind::Silent:
            Hold(*transfer);
            return Errors::Success;
        case FaultKind::Short:
            Shorten(*transfer, transfer->fault->argument.value_or(transfer->length / 2));
            break;
        case FaultKind::Long:
            if (!transfer->IsIn()) {
                return EndWith(*transfer, TransferStatus::Overflow);
            }
            break;
        case FaultKind::Stale:
        case FaultKind::Garbage:
        case FaultKind::Flip:
            if (!transfer->IsIn()) {
                dataFaults_.ReplaceOut(*transfer);
            } else if (transfer->Has(FaultKind::Stale)) {
                return AnswerWithLastData(transfer);
            }
            break;
        case FaultKind::GoneBefore:
            UnplugDevice(transfer.get());  // this one is refused
            return Errors::DeviceNotConnected;
        case FaultKind::GoneDuring:
            if (transfer->endpoint == 0 || transfer->IsIn() || transfer->length <= 1) {
                UnplugDevice(transfer.get());
                return EndWith(*transfer, TransferStatus::DeviceGone);
            }
            Shorten(*transfer, transfer->length / 2);
            break;
        case FaultKind::Late:
        case FaultKind::LateCancel:
        case FaultKind::GoneAfter:
            break;
    }
    return Forward(transfer);
}

ErrorCode FaultInjector::Forward(const TransferPointer& transfer) {
    if (!IsUnderWay(*transfer)) {
        return Errors::Success;  // cancelled while it was held
    }
    if (!transfer->IsIn()) {
        dataFaults_.KeepOut(*transfer);
    }
    if (const std::uint8_t endpoint = ClearedEndpoint(*transfer); endpoint != 0) {
        const std::lock_guard lock(mutex_);
        halted_.erase(endpoint);
    }
    return PassOn(transfer);
}

ErrorCode FaultInjector::AnswerWithLastData(const TransferPointer& transfer) {
    const std::optional<std::uint32_t> length = dataFaults_.RepeatIn(*transfer);
    if (!length) {
        return Forward(transfer);  // there are none to repeat
    }
    End(*transfer, TransferStatus::Completed, *length);
    return Errors::Success;
}

ErrorCode FaultInjector::EndWith(const FaultyTransfer& transfer, TransferStatus status) {
    End(transfer, status, 0);
    return Errors::Success;
}

bool FaultInjector::Hold(FaultyTransfer& transfer) {
    const bool holds = HoldBack(transfer, InterceptedTransfer::State::Held);
    if (!holds) {
        End(transfer, Gone() ? TransferStatus::DeviceGone : TransferStatus::Cancelled, 0);
    }
    return holds;
}

void FaultInjector::HoldFor(const TransferPointer& transfer, std::uint32_t milliseconds) {
    transfer->wasHeld = true;
    if (Hold(*transfer)) {
        const std::uint64_t end = scheduler_.Now() + std::uint64_t{milliseconds} * 1000;
        scheduler_.CallAt(
            end, [this, transfer] { TimeHasCome(transfer); }, this);
    }
}

void FaultInjector::TimeHasCome(const TransferPointer& transfer) noexcept {
    if (!IsUnderWay(*transfer)) {
        return;
    }
    ErrorCode code = Errors::Success;
    try {
        code = Begin(transfer);
    } catch (...) {  // no memory
        code = Errors::NotEnoughMemory;
    }
    if (code != Errors::Success) {
        End(*transfer,
            code == Errors::DeviceNotConnected ? TransferStatus::DeviceGone : TransferStatus::IoError, 0);
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
    return InterceptingDevice::ClearHalt(endpoint);
}

void FaultInjector::Completed(InterceptedTransfer& copy) noexcept {
    auto& transfer = static_cast<FaultyTransfer&>(copy);
    if (transfer.Has(FaultKind::LateCancel) && transfer.status == TransferStatus::Completed && !Gone() &&
        HoldBack(transfer, InterceptedTransfer::State::HeldWithData)) {
        return;
    }
    const bool unplugs = transfer.Has(FaultKind::GoneDuring) || transfer.Has(FaultKind::GoneAfter);
    ChangeOutcome(transfer);
    End(transfer, transfer.status, transfer.actualLength);
    if (unplugs) {
        UnplugDevice();
    }
}

void FaultInjector::ChangeOutcome(FaultyTransfer& transfer) {
    if (Gone() || transfer.Has(FaultKind::GoneDuring)) {
        transfer.status = TransferStatus::DeviceGone;
    } else if (transfer.Has(FaultKind::LateCancel) && transfer.status == TransferStatus::Completed) {
        transfer.status = TransferStatus::Cancelled;
    } else if (transfer.Has(FaultKind::Long) && transfer.status == TransferStatus::Completed) {
        transfer.status = TransferStatus::Overflow;
    }
    if (transfer.IsIn()) {
        dataFaults_.ChangeIn(transfer);
    }
}

/// `except`, which may be null, is the caller's to end.
void FaultInjector::UnplugDevice(const FaultyTransfer* except) {
    {
        const std::lock_guard lock(mutex_);
        if (std::exchange(gone_, true)) {
            return;
        }
    }
    if (unplug_) {
        unplug_();
    }
    EndAll(TransferStatus::DeviceGone, except);
}

}  // namespace

std::shared_ptr<UsbDevice> InjectFaults(std::shared_ptr<UsbDevice> device,
                                        std::shared_ptr<FaultScript> script,
                                        Platform::EventScheduler& scheduler, std::function<void()> unplug) {
    return std::make_shared<FaultInjector>(std::move(device), std::move(script), scheduler,
                                           std::move(unplug));
}

}  // namespace Varnholt::Simulator
