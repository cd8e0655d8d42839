#include "Platform/Usb/UsbIpOperations.h"

#include <array>
#include <span>
#include <utility>

#include "Platform/LookUp.h"
#include "Protocol/ByteOrder.h"

namespace Varnholt::Platform::Usb {
namespace {

/// A list is there by then, or not looked at.
constexpr auto ListPatience = std::chrono::milliseconds(1000);

/// Sends an operation's request and receives the header of its reply.
std::optional<UsbIp::OperationHeader> Ask(UsbIpSocket& socket, UsbIp::Operation request,
                                          std::span<const std::uint8_t> argument, UsbIp::Operation reply) {
    UsbIp::OperationHeader header;
    header.operation = request;
    UsbIp::OperationBytes bytes = UsbIp::Encode(header);
    if (!socket.Send(bytes, argument) || !socket.Receive(bytes, true)) {
        return std::nullopt;
    }
    header = UsbIp::DecodeOperation(bytes);
    return header.operation == reply ? std::optional(header) : std::nullopt;
}

ErrorCode ErrorOfImport(UsbIp::OperationStatus status) {
    static constexpr std::pair<UsbIp::OperationStatus, ErrorCode> errors[] = {
        {UsbIp::OperationStatus::NotAvailable, Errors::Busy},
        {UsbIp::OperationStatus::Busy, Errors::Busy},
        {UsbIp::OperationStatus::NoDevice, Errors::DeviceNotConnected},
    };
    return LookUp(errors, status, Errors::GeneralFailure);
}

}  // namespace

ErrorCode ImportUsbIpDevice(UsbIpSocket& socket, const std::string& busId, std::uint32_t& deviceId) {
    const UsbIp::BusIdBytes id = UsbIp::EncodeBusId(busId);
    const auto reply = Ask(socket, UsbIp::Operation::ImportRequest, id, UsbIp::Operation::ImportReply);
    if (!reply) {
        return Errors::DeviceNotConnected;
    }
    if (reply->status != UsbIp::OperationStatus::Ok) {
        return ErrorOfImport(reply->status);
    }
    UsbIp::DeviceRecordBytes bytes{};
    if (!socket.Receive(bytes, true)) {
        return Errors::DeviceNotConnected;
    }
    deviceId = UsbIp::DecodeDeviceRecord(bytes).DeviceId();
    return Errors::Success;
}

std::optional<UsbIp::DeviceRecord> FirstUsbIpDevice(UsbIpSocket& socket) {
    socket.ReceiveUntil(UsbIpSocket::Clock::now() + ListPatience);
    const auto reply = Ask(socket, UsbIp::Operation::ListRequest, {}, UsbIp::Operation::ListReply);
    std::array<std::uint8_t, UsbIp::ListCountSize> count{};
    if (!reply || reply->status != UsbIp::OperationStatus::Ok || !socket.Receive(count, true) ||
        Protocol::LoadBig32(count.data()) == 0) {
        return std::nullopt;
    }
    UsbIp::DeviceRecordBytes bytes{};
    return socket.Receive(bytes, true) ? std::optional(UsbIp::DecodeDeviceRecord(bytes)) : std::nullopt;
}

}  // namespace Varnholt::Platform::Usb
