#pragma once

#include <array>
#include <atomic>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "Platform/Drivers/SharedDevice.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Platform::Drivers {

/// The USBIO status for a request that the USB device refused with `usbCode`. Codes without a USBIO meaning
/// become "request failed"; a refusal for lack of permission stays `Errors::AccessDenied`.
ErrorCode UsbIoRefusalOf(ErrorCode usbCode);

/// The USBIO driver's state of one instrument, shared by the files that are open on it: the configuration,
/// the bound pipes, the device parameters. Codes are USBIO statuses; all operations may be called from any
/// thread.
class UsbIoDevice final {
  public:
    /// The endpoint that a file is bound to, 0 for none. Changed by `Bind` only.
    using Binding = std::atomic<std::uint8_t>;
    using Parameters = std::array<std::uint8_t, Protocol::UsbIoDriver::DeviceParametersSize>;

    explicit UsbIoDevice(std::shared_ptr<SharedDevice> shared);
    /// Ends the configuration, and with it the claim.
    ~UsbIoDevice();
    UsbIoDevice(const UsbIoDevice&) = delete;
    UsbIoDevice& operator=(const UsbIoDevice&) = delete;

    /// Claims the device. The block has been measured, its content is checked here.
    ErrorCode Configure(std::span<const std::uint8_t> block);
    /// Gives the claim back. A device that is not configured stays so, which is no failure.
    ErrorCode Unconfigure();

    ErrorCode Bind(std::uint8_t endpoint, Binding& binding);
    /// Of 0 nothing: no pipe is bound to it.
    void Unbind(std::uint8_t endpoint);

    Parameters ReadParameters();
    void WriteParameters(const Parameters& source);

    /// Largest transfer of the configuration; it does not change while a pipe is bound.
    std::uint32_t MaximumTransfer() const { return maximumTransfer_.load(std::memory_order_relaxed); }

    const std::shared_ptr<SharedDevice>& Shared() const { return device_; }

  private:
    const std::shared_ptr<SharedDevice> device_;

    RecursiveMutex lock_;  ///< guards what follows; taken before the locks of the shared device
    bool configured_ = false;
    std::vector<std::uint8_t> bound_;
    Parameters parameters_{};
    std::atomic<std::uint32_t> maximumTransfer_{0};
};

}  // namespace Varnholt::Platform::Drivers
