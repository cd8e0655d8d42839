#pragma once

#include <memory>

#include "Platform/DeviceFiles.h"
#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Drivers {

/// Makes the device files that the two kernel drivers of the instrument present on Windows, over the USB
/// devices of `bus`: the instrument's own driver and the USBIO driver. Both list every instrument of the bus;
/// a path is the driver's name, a slash and the bus's name for the instrument ("native/...", "usbio/..."),
/// pipes of the native driver stand below it as "\PIPE01" to "\PIPE03".
///
/// All handles of one path share one USB device, which is opened with the first and closed with the last.
/// `bus` must outlive the result.
std::unique_ptr<DeviceFileSystem> MakeDriverFileSystem(Usb::UsbBus& bus);

}  // namespace Varnholt::Platform::Drivers
