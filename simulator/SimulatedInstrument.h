#pragma once

#include <array>
#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <vector>

#include "Alarm.h"
#include "Commands.h"
#include "InstrumentSettings.h"
#include "Platform/EventScheduler.h"
#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Simulator {

class Completions;

/// The instrument as a USB device. What it has no data for stays pending (the device says NAK) until data
/// come or it is cancelled; what it does not know stalls. It answers the standard requests, so that an
/// operating system can attach it.
///
/// It can be used as a device itself, or through any number of connections as a bus hands them out.
class SimulatedInstrument final : public Platform::Usb::UsbDevice {
  public:
    /// `eventScheduler` must outlive the instrument.
    explicit SimulatedInstrument(Platform::EventScheduler& eventScheduler,
                                 InstrumentSettings instrumentSettings = {});
    ~SimulatedInstrument() override;
    SimulatedInstrument(const SimulatedInstrument&) = delete;
    SimulatedInstrument& operator=(const SimulatedInstrument&) = delete;

    std::vector<Platform::Usb::EndpointInfo> Endpoints(Platform::ErrorCode& error) override;
    /// Exclusive: `Errors::Busy` while it is claimed, also by the same caller.
    Platform::ErrorCode Claim() override { return ClaimFor(ownAttachment_); }
    void Release() override { ReleaseFor(ownAttachment_); }
    Platform::ErrorCode Submit(Platform::Usb::Transfer& transfer) override {
        return SubmitFor(ownAttachment_, transfer);
    }
    void Cancel(Platform::Usb::Transfer& transfer) override;
    Platform::ErrorCode ClearHalt(std::uint8_t endpoint) override {
        return ClearHaltFor(ownAttachment_, endpoint);
    }

    /// The instrument as seen through one opening of it: a connection that was made before the instrument was
    /// unplugged stays without a device. Ends its transfers and its claim with its life.
    static std::shared_ptr<Platform::Usb::UsbDevice> Connect(std::shared_ptr<SimulatedInstrument> instrument);

    /// Everything under way ends with `DeviceGone`; what is not in a lasting memory is lost.
    void Unplug();
    void PlugIn();
    bool PluggedIn() const;

    /// One interrupt report; it waits in the instrument until the host fetches it.
    void PressButton();
    void HaltEndpoint(std::uint8_t endpoint);

    /// Looks into the instrument, or changes it, while nothing else does: `look` is called with its commands.
    template <class Function>
    auto WithCommands(Function look) {
        const std::lock_guard lock(mutex_);
        return look(commands_);
    }
    std::vector<std::uint8_t> Eeprom();
    void SetEeprom(const std::vector<std::uint8_t>& content);
    /// Transfers that it has accepted and not completed.
    std::size_t PendingTransfers() const;
    bool Claimed() const;
    const InstrumentSettings& Settings() const { return settings_; }

  private:
    class Connection;

    /// Who opened the instrument, and in which of its times between two unpluggings.
    struct Attachment {
        std::uint64_t plugging = 0;
    };
    struct Pending {
        Platform::Usb::Transfer* transfer;
        const Attachment* owner;
        std::uint64_t since;  // nanoseconds
    };
    struct Endpoint {
        std::vector<Pending> queue;
        bool halted = false;
    };

    static constexpr std::uint64_t Never = ~std::uint64_t{0};

    std::uint64_t Plugging() const;
    Platform::ErrorCode ClaimFor(const Attachment& attachment);
    void ReleaseFor(const Attachment& attachment);
    Platform::ErrorCode SubmitFor(const Attachment& attachment, Platform::Usb::Transfer& transfer);
    Platform::ErrorCode ClearHaltFor(const Attachment& attachment, std::uint8_t endpoint);
    void Drop(const Attachment& attachment);
    void WaitForClients() const;
    void DataDue();
    /// Nanoseconds of the scheduler's clock; 0 when no transfer takes time.
    std::uint64_t TimeIfItMatters();

    // Called with the lock held.
    bool Attached(const Attachment& attachment) const {
        return pluggedIn_ && (&attachment == &ownAttachment_ || attachment.plugging == plugging_);
    }
    Endpoint* FindEndpoint(std::uint8_t address);
    void Control(Platform::Usb::Transfer& transfer, std::uint64_t now, Completions& done);
    bool StandardOut(const Platform::Usb::SetupPacket& setup, Completions& done);
    std::vector<std::uint8_t> StandardIn(const Platform::Usb::SetupPacket& setup);
    void Halt(Endpoint& endpoint, Completions& done);
    /// Completes what can be completed now and says in `nextDataAt` when it is worth looking again.
    void Serve(std::uint64_t now, Completions& done);
    void ServeBulkOut(Completions& done);
    void ServeBulkIn(std::uint64_t now, Completions& done);
    void ServeInterrupt(Completions& done);
    std::uint64_t Duration(std::uint64_t bytes) const;
    std::uint64_t Begin(const Pending& pending) const;
    /// The whole packets of a transfer that is being cancelled that came before.
    std::uint32_t TakeWhatMoved(const Pending& pending, std::uint64_t now);

    const InstrumentSettings settings_;
    Platform::EventScheduler& scheduler_;
    const bool timed_;  // transfers take time
    const Attachment ownAttachment_;

    mutable std::mutex mutex_;  // guards what follows; not held while a client or the scheduler is called
    Commands commands_;
    std::array<Endpoint, 3> endpoints_;  // as in the descriptors
    const Attachment* claimedBy_ = nullptr;
    std::uint64_t plugging_ = 1;
    bool pluggedIn_ = true;
    std::uint8_t configuration_ = 0;
    bool buttonReportWaits_ = false;
    bool eepromChanged_ = false;     // to be reported
    std::uint64_t answersFrom_ = 0;  // nanoseconds: when the first byte of the answer can move
    std::uint64_t lineFreeFrom_ = 0;
    std::uint64_t nextDataAt_ = Never;

    std::atomic<int> completing_ = 0;  // completed transfers whose clients have not returned yet
    Alarm dataAlarm_;
    Alarm buttonAlarm_;
};

}  // namespace Varnholt::Simulator
