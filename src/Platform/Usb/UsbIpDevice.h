#pragma once

#include <memory>
#include <string>

#include "Platform/Usb/UsbDevice.h"
#include "Platform/Usb/UsbIpOperations.h"

namespace Varnholt::Platform::Usb {

/// The device with the bus id `busId` that a USB/IP peer exports. It is imported when it is claimed, and the
/// connection lasts as long as the claim; so does the thread that reads from it. A peer that closes the
/// connection, breaks the protocol, stops in the middle of a message or leaves a cancellation unanswered is
/// treated as one whose device was unplugged.
std::shared_ptr<UsbDevice> MakeUsbIpDevice(UsbIpConnector connect, std::string busId);

}  // namespace Varnholt::Platform::Usb
