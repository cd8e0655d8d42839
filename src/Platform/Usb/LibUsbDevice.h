#pragma once

#include <memory>
#include <string>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Usb {

/// Opens the USB device behind a device node ("/dev/bus/usb/BBB/DDD") through libusb. Null on failure with
/// the code in `error`: `AccessDenied` without permission on the node, `FileNotFound` without the node.
///
/// The device has a libusb context and an event thread of its own, gone with it.
std::shared_ptr<UsbDevice> OpenLibUsbDevice(const std::string& deviceNode, ErrorCode& error);

}  // namespace Varnholt::Platform::Usb
