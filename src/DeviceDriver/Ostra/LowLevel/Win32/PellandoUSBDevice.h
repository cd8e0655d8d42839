#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "DeviceDriver/Generic/EventListener.h"
#include "DeviceDriver/Ostra/LowLevel/ScanReceiver.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/InterruptListener.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/ScanRecord.h"
#include "Protocol/NativeDriver.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// One opened instrument on its own kernel driver: its pipes, its interrupt listener, and the device lock
/// that every transfer takes for its whole run. The lock is recursive and shared with everybody on the
/// machine who has opened the same path.
///
/// Lock order: the device lock comes first; the interrupt listener's lock, or the one that guards the closing
/// of the pipes, may be taken under it, each for a moment and never with another inside. The listener thread
/// holds no lock when it brings a message and takes the device lock then, so it waits for nobody who waits
/// for it.
///
/// Messages are passed on under the device lock, on the listener's thread. A message of 20010 closes the
/// pipes, if there was somebody to pass it on to; every later transfer then fails.
///
/// Failures are `IOException` and `TimeoutException`. Time-outs are milliseconds.
class PellandoUSBDevice final : public Generic::EventListener {
  public:
    /// `listener` may be null; it is not owned and must live until it is removed or the device is closed.
    PellandoUSBDevice(Generic::EventListener* listener, const std::string& devicePath);
    /// `Shutdown`, and closes the pipes; within bounded time. May be called from inside a message.
    ~PellandoUSBDevice() override;
    PellandoUSBDevice(const PellandoUSBDevice&) = delete;
    PellandoUSBDevice& operator=(const PellandoUSBDevice&) = delete;

    /// Forgets the listener, whichever it is. No message reaches it once this has returned. May be called
    /// from inside a message.
    void RemoveListener(Generic::EventListener* listener);
    void MessageFromDevice(std::uint32_t code, std::uint32_t parameter) override;

    /// A vendor request. `data`: `length` bytes sent or received, as the block's direction says. Gives the
    /// bytes that the driver says it moved.
    std::uint32_t PerformDeviceIOControl(const Protocol::NativeDriver::ControlBlock& block, void* data,
                                         std::uint32_t length);
    void ReadData(void* buffer, std::uint32_t length, std::uint32_t timeout);
    void WriteData(const void* buffer, std::uint32_t length, std::uint32_t timeout);

    /// Append what the instrument streams in records of `recordSize` bytes, 1 to 6553: until it sends a short
    /// (or empty) transfer, or until `total` bytes have come. Bytes behind the last whole record are dropped.
    /// Each transfer gets the time-out plus 3000 ms. Records that came before a failure stay in the list.
    void ReadDataStrip(ScanRecordList& records, std::uint32_t recordSize, std::uint32_t timeout);
    void ReadDataCountedStrip(ScanRecordList& records, std::uint32_t recordSize, std::uint32_t timeout,
                              std::uint32_t total);
    /// The same reads for a receiver, which gets every byte that comes, of a transfer that fails too.
    void ReadDataStrip(ScanReceiver& receiver, std::uint32_t recordSize, std::uint32_t timeout);
    void ReadDataCountedStrip(ScanReceiver& receiver, std::uint32_t recordSize, std::uint32_t timeout,
                              std::uint32_t total);

    const std::string& GetAddress() const;

    /// The paths of the instruments that are connected, at most 127, in the platform's order.
    static std::vector<std::string> GetAllDevices();
    /// The path at `index`; empty when there is none or the platform cannot tell.
    static std::string ScanDevice(std::uint16_t index);

    /// `text` without everything that is not an ASCII letter or digit.
    static std::string StripStrangeChars(const std::string& text);

    /// Makes this object the interrupt listener's receiver and starts it, as the constructor does; harmless
    /// when it runs.
    void SetupInterruptListener();
    /// Says farewell to the instrument and stops the interrupt listener. The pipes stay open. From here on
    /// the end of the interrupt pipe is no news: no message of 20010 is passed on.
    void Shutdown();
    /// Two controls for an instrument whose button was never pressed. Takes no lock and reports no failure.
    void HandleUntouchedButton();

  private:
    class Core;
    /// What becomes of the data of a transfer that failed.
    enum class PartialData { Dropped, Received };

    /// Without a total, until the instrument ends it.
    void ReadStrip(ScanReceiver& receiver, PartialData partialData, std::uint32_t recordSize,
                   std::uint32_t timeout, std::optional<std::uint32_t> total);

    const std::shared_ptr<Core> core_;  ///< with the listener's thread, while that delivers a message
    InterruptListener interruptListener_;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
