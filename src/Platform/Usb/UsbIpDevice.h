#pragma once

#include <functional>
#include <memory>
#include <string>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Usb {

/// Makes a connection to the peer that exports a device: a connected stream socket, which the caller takes
/// over, or -1 with the reason in `error`.
using UsbIpConnector = std::function<int(ErrorCode& error)>;

/// The device with the bus id `busId` that a USB/IP peer exports. It is imported when it is claimed, and the
/// connection lasts as long as the claim; so does the thread that reads from it. A peer that closes the
/// connection, breaks the protocol, stops in the middle of a message or leaves a cancellation unanswered is
/// treated as one whose device was unplugged.
std::shared_ptr<UsbDevice> MakeUsbIpDevice(UsbIpConnector connect, std::string busId);

}  // namespace Varnholt::Platform::Usb
