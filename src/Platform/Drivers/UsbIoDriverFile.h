#pragma once

#include <cstdint>
#include <memory>
#include <span>

#include "Platform/Drivers/DriverFile.h"
#include "Platform/Drivers/UsbIoDevice.h"

namespace Varnholt::Platform::Drivers {

/// A file of the USBIO driver: takes the driver's device controls, and reads or writes once it is bound to an
/// endpoint. Opening it does not touch the USB device, so that any number of processes can list instruments
/// that one of them uses; configuring claims it.
///
/// A vendor request needs a claimed device, not a bound pipe. The driver clears the halt of an endpoint
/// before the next transfer on it, or with the last claim. Once the device is known to be gone every control
/// but the driver information ends with `Status::DeviceRemoved`.
class UsbIoDriverFile final : public DriverFile {
  public:
    explicit UsbIoDriverFile(std::shared_ptr<UsbIoDevice> usbIoDevice);
    /// Unbinds.
    ~UsbIoDriverFile() override;

    Decision Move(bool in, Usb::Transfer& transfer) override;
    Decision Control(std::uint32_t code, std::span<const std::uint8_t> input, std::span<std::uint8_t> output,
                     Usb::Transfer& transfer) override;

    ErrorCode OutcomeOf(Usb::TransferStatus status) const override;
    ErrorCode RefusalOf(ErrorCode usbCode) const override { return UsbIoRefusalOf(usbCode); }
    /// 5 s for a control, 5 s and 10 ms a byte for a write, none for a read.
    std::uint32_t TimeLimitOf(const Usb::Transfer& transfer) const override;
    ErrorCode TimedOutCode() const override { return Protocol::UsbIoDriver::Status::TimedOut; }

  private:
    Decision VendorRequest(bool in, std::span<const std::uint8_t> block, std::span<std::uint8_t> data,
                           Usb::Transfer& transfer) const;

    const std::shared_ptr<UsbIoDevice> usbIo_;
    UsbIoDevice::Binding binding_{0};
};

}  // namespace Varnholt::Platform::Drivers
