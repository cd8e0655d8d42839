#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "Platform/ErrorCodes.h"
#include "Platform/Usb/UsbIpProtocol.h"
#include "Platform/Usb/UsbIpSocket.h"

/// What a USB/IP connection begins with, before there are packets.
namespace Varnholt::Platform::Usb {

/// Imports the device with the bus id `busId`; packets to it carry `deviceId`.
ErrorCode ImportUsbIpDevice(UsbIpSocket& socket, const std::string& busId, std::uint32_t& deviceId);

/// The first device that a peer exports; nothing when there is none or the peer does not answer properly
/// within a second. The connection is of no use afterwards.
std::optional<UsbIp::DeviceRecord> FirstUsbIpDevice(UsbIpSocket& socket);

}  // namespace Varnholt::Platform::Usb
