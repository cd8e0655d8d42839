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
/// operating system can attach it. It is reached through any number of connections, as a bus hands them out.
class SimulatedInstrument final {
  public:
    /// `eventScheduler` must outlive the instrument.
    explicit SimulatedInstrument(Platform::EventScheduler& eventScheduler,
                                 InstrumentSettings instrumentSettings = {});
    ~SimulatedInstrument();
    SimulatedInstrument(const SimulatedInstrument&) = delete;
    SimulatedInstrument& operator=(const SimulatedInstrument&) = delete;

    /// The instrument as seen through one opening of it: a connection that was made before the instrument was
    /// unplugged stays without a device. A claim is exclusive: `Errors::Busy` while there is one, also the
    /// connection's own. Claim and transfers end with the connection's life.
    static std::shared_ptr<Platform::Usb::UsbDevice> Connect(
        const std::shared_ptr<SimulatedInstrument>& instrument);

    /// Everything under way ends with `DeviceGone`; what is not in a lasting memory is lost.
    void Unplug();
    void PlugIn();
    bool PluggedIn() const;

    /// One interrupt report; it waits in the instrument until the host fetches it.
    void PressButton();

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

  private:
    class Connection;

    struct Pending {
        Platform::Usb::Transfer* transfer;
        const Connection* owner;
        std::uint64_t since;  // nanoseconds
    };
    struct Endpoint {
        std::vector<Pending> queue;
        bool halted = false;
    };

    static constexpr std::uint64_t Never = ~std::uint64_t{0};

    void WaitForClients() const;
    /// Calls `change` with the lock held, completes what can be completed then, and tells those concerned
    /// once the lock is free. It gets the time (nanoseconds of the scheduler's clock; 0 when no transfer
    /// takes time) and the completions.
    template <class Change>
    void Do(Change change);

    // Called with the lock held.
    Endpoint* FindEndpoint(std::uint8_t address);
    void Control(Platform::Usb::Transfer& transfer, std::uint64_t now, Completions& done);
    bool StandardOut(const Platform::Usb::SetupPacket& setup, Completions& done);
    std::vector<std::uint8_t> StandardIn(const Platform::Usb::SetupPacket& setup);
    static void EndAll(Endpoint& endpoint, Platform::Usb::TransferStatus status, Completions& done);
    static void Halt(Endpoint& endpoint, Completions& done);
    void ServeBulkOut(Completions& done);
    /// Says in `nextDataAt_` when it is worth looking again.
    void ServeBulkIn(std::uint64_t now, Completions& done);
    void ServeInterrupt(Completions& done);
    std::uint64_t Duration(std::uint64_t bytes) const;
    std::uint64_t Begin(const Pending& pending) const;
    /// The whole packets of a transfer that is being cancelled that came before.
    std::uint32_t TakeWhatMoved(const Pending& pending, std::uint64_t now);

    const InstrumentSettings settings_;
    Platform::EventScheduler& scheduler_;
    const bool timed_;  // transfers take time

    mutable std::mutex mutex_;  // guards what follows; not held while a client or the scheduler is called
    Commands commands_;
    std::array<Endpoint, 3> endpoints_;  // as in the descriptors
    const Connection* claimedBy_ = nullptr;
    std::uint64_t plugging_ = 1;  // counts the times between two unpluggings
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
