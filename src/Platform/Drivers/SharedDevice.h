#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "Platform/Usb/UsbDevice.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform::Drivers {

/// The one USB device behind all open files of an instrument. It is opened at the first claim and closed with
/// the object. All operations may be called from any thread.
class SharedDevice final {
  public:
    /// `abort` ends what runs on an endpoint of the device, whichever file and thread started it.
    using Abort = std::function<void(const SharedDevice& device, std::uint8_t endpoint)>;

    SharedDevice(Usb::UsbBus& usbBus, std::string nameOnBus, Abort abort);
    SharedDevice(const SharedDevice&) = delete;
    SharedDevice& operator=(const SharedDevice&) = delete;

    /// Takes a share in the claim to the USB device; the first one opens and claims it. May block.
    ErrorCode Claim();
    /// Gives one share back; the last clears what is halted and releases the device, which stays open. May
    /// block.
    void Unclaim();
    bool IsClaimed();
    /// `absent` where a claimed device has no such endpoint, its code where that cannot be found out. May
    /// block.
    ErrorCode FindEndpoint(std::uint8_t endpoint, ErrorCode absent);

    /// Hands a transfer of a claimed device to it, after clearing a halt of its endpoint.
    ErrorCode Submit(Usb::Transfer& transfer);
    void Cancel(Usb::Transfer& transfer);
    void AbortEndpoint(std::uint8_t endpoint) const { abort_(*this, endpoint); }
    /// As `UsbDevice::CompletionsOf`, of a claimed device.
    std::shared_ptr<CompletionSource> CompletionsOf(std::uint8_t endpoint);
    /// Remembers what the end of a transfer says about the device. Before the end is made known.
    void Learn(const Usb::Transfer& transfer);

    /// Known to be unplugged; it does not come back, whatever is plugged in at its place.
    bool IsGone() const { return gone_.load(std::memory_order_relaxed); }

  private:
    ErrorCode ClearHalt(std::uint8_t endpoint);
    void ClearHalts() noexcept;
    ErrorCode Note(ErrorCode code);

    Usb::UsbBus& bus_;
    const std::string name_;
    const Abort abort_;

    RecursiveMutex setup_;  ///< guards opening, the claim and the clearing of halts, all of which may block
    std::uint32_t claims_ = 0;                ///< guarded by `setup`
    std::shared_ptr<Usb::UsbDevice> opened_;  ///< guarded by `setup`; once set, set for good
    std::atomic<Usb::UsbDevice*> usb_{nullptr};
    std::atomic<std::uint32_t> halted_{0};  ///< one bit for each endpoint that answered with STALL
    std::atomic<bool> gone_{false};
};

}  // namespace Varnholt::Platform::Drivers
