#pragma once

#include <string>
#include <vector>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Usb {

/// The udev property that marks a USB device as an instrument; set by a rule that `ostra register` writes.
/// Vendor and product numbers are never looked at here.
inline constexpr const char* InterfaceClassProperty = "OSTRA_INTERFACE_CLASS";

/// A USB device as udev and sysfs show it.
struct UsbDeviceInfo {
    std::string name;          ///< "usb-1p1p2": where it is plugged in; survives replugging
    std::string deviceNode;    ///< "/dev/bus/usb/001/005"
    std::string systemPath;    ///< its folder below /sys
    std::string vendorId;      ///< four hexadecimal digits
    std::string productId;     ///< four hexadecimal digits
    std::string manufacturer;  ///< empty where the device has no such text
    std::string product;
    std::string serial;
    std::string kernelDriver;  ///< driver bound to interface 0; empty without one
    bool registered = false;   ///< carries the property
};

/// The instruments that are plugged in for real: the USB devices with the property, ordered by port.
std::vector<UsbDeviceInfo> ListRegisteredDevices();

/// The devices whose first interface has the instrument's three endpoints, registered or not, ordered by
/// port.
std::vector<UsbDeviceInfo> ListCandidateDevices();

/// The bus of the instruments that are plugged in for real.
UsbBus& RealUsbBus();

}  // namespace Varnholt::Platform::Usb
