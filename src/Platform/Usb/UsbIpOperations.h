#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Platform/ErrorCodes.h"
#include "Platform/Usb/UsbIpProtocol.h"
#include "Platform/Usb/UsbIpSocket.h"

/// What a USB/IP connection begins with, before there are packets.
namespace Varnholt::Platform::Usb {

/// Makes a connection to the peer that exports a device: a connected stream socket, which the caller takes
/// over, or -1 with the reason in `error`.
using UsbIpConnector = std::function<int(ErrorCode& error)>;

/// Null on failure with the code in `error`.
std::unique_ptr<UsbIpSocket> ConnectUsbIp(const UsbIpConnector& connect, ErrorCode& error);

/// Imports the device with the bus id `busId`; packets to it carry `deviceId`.
ErrorCode ImportUsbIpDevice(UsbIpSocket& socket, const std::string& busId, std::uint32_t& deviceId);

/// The devices that a peer exports, from a connection of its own; nothing when it does not answer properly
/// within a second.
std::optional<std::vector<UsbIp::DeviceRecord>> ListUsbIpDevices(const UsbIpConnector& connect);

}  // namespace Varnholt::Platform::Usb
