#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <variant>

#include "Platform/Usb/UsbDevice.h"

/// The USB/IP protocol, version 1.1.1, as the Linux kernel speaks it: messages and their bytes. All numbers
/// are sent most significant byte first, except inside setup packets and payloads.
///
/// A connection begins with an operation: a list of devices, after which it is closed, or the import of one.
/// After an import it carries packets, each a header and, where it says so, a payload.
namespace Varnholt::Platform::Usb::UsbIp {

inline constexpr std::uint16_t ProtocolVersion = 0x0111;
inline constexpr std::uint16_t TcpPort = 3240;

enum class Operation : std::uint16_t {
    ListRequest = 0x8005,
    ListReply = 0x0005,
    ImportRequest = 0x8003,  ///< a bus id follows
    ImportReply = 0x0003,    ///< a device record follows when the status is `Ok`
};

enum class OperationStatus : std::uint32_t { Ok = 0, NotAvailable = 1, Busy = 2, Failed = 3, NoDevice = 4 };

struct OperationHeader {
    std::uint16_t version = ProtocolVersion;
    Operation operation{};
    OperationStatus status = OperationStatus::Ok;
};
inline constexpr std::size_t OperationHeaderSize = 2 + 2 + 4;

inline constexpr std::size_t PathSize = 256;
inline constexpr std::size_t BusIdSize = 32;
inline constexpr std::uint32_t HighSpeed = 3;

struct DeviceRecord {
    std::string path;   ///< free text
    std::string busId;  ///< names the device in an import
    std::uint32_t busNumber = 0;
    std::uint32_t deviceNumber = 0;
    std::uint32_t speed = HighSpeed;
    std::uint16_t vendorId = 0;
    std::uint16_t productId = 0;
    std::uint16_t version = 0;
    std::array<std::uint8_t, 3> classes{};  ///< class, subclass, protocol
    std::uint8_t configurationValue = 0;
    std::uint8_t configurations = 0;
    std::uint8_t interfaces = 0;

    /// Names the device in packets.
    std::uint32_t DeviceId() const { return busNumber << 16 | deviceNumber; }
    bool operator==(const DeviceRecord&) const = default;
};
inline constexpr std::size_t DeviceRecordSize =
    PathSize + BusIdSize + 3 * sizeof(std::uint32_t) + 3 * sizeof(std::uint16_t) + 6;
static_assert(DeviceRecordSize == 312);

/// Follows a device record in a list, once for each interface: class, subclass, protocol, padding.
inline constexpr std::size_t InterfaceRecordSize = 4;
inline constexpr std::size_t ListCountSize = 4;

using OperationBytes = std::array<std::uint8_t, OperationHeaderSize>;
using DeviceRecordBytes = std::array<std::uint8_t, DeviceRecordSize>;
using BusIdBytes = std::array<std::uint8_t, BusIdSize>;

OperationBytes Encode(const OperationHeader& header);
OperationHeader DecodeOperation(std::span<const std::uint8_t, OperationHeaderSize> bytes);
DeviceRecordBytes Encode(const DeviceRecord& record);
DeviceRecord DecodeDeviceRecord(std::span<const std::uint8_t, DeviceRecordSize> bytes);
/// Cut where it is too long.
BusIdBytes EncodeBusId(const std::string& busId);
std::string DecodeBusId(std::span<const std::uint8_t, BusIdSize> bytes);

/// Longest payload that either side accepts.
inline constexpr std::uint32_t MaximumPayload = 16U << 20;

/// Starts a transfer; an OUT transfer's data follow.
struct SubmitPacket {
    std::uint32_t sequence = 0;
    std::uint32_t deviceId = 0;
    std::uint8_t endpoint = 0;  ///< as in `Transfer`
    std::uint32_t length = 0;
    std::uint32_t interval = 0;
    SetupPacket setup;
    bool in = false;

    bool operator==(const SubmitPacket&) const = default;
};
/// Ends the transfer of packet `victim`.
struct UnlinkPacket {
    std::uint32_t sequence = 0;
    std::uint32_t deviceId = 0;
    std::uint32_t victim = 0;

    bool operator==(const UnlinkPacket&) const = default;
};
/// The outcome of a transfer; the data of an IN transfer follow.
struct SubmitReply {
    std::uint32_t sequence = 0;
    std::int32_t status = 0;
    std::uint32_t actualLength = 0;

    bool operator==(const SubmitReply&) const = default;
};
struct UnlinkReply {
    std::uint32_t sequence = 0;  ///< the unlink packet's own
    std::int32_t status = 0;     ///< `StatusOf(Cancelled)`, or 0 when the transfer was over already

    bool operator==(const UnlinkReply&) const = default;
};
using Packet = std::variant<SubmitPacket, UnlinkPacket, SubmitReply, UnlinkReply>;

inline constexpr std::size_t PacketHeaderSize = 48;
using PacketBytes = std::array<std::uint8_t, PacketHeaderSize>;

PacketBytes Encode(const Packet& packet);
/// Nothing for a header that no packet has: an unknown command, an endpoint above 15, an isochronous
/// transfer, a payload that is too long.
std::optional<Packet> DecodePacket(std::span<const std::uint8_t, PacketHeaderSize> bytes);

/// How transfers end in the words of Linux, on every platform: its error numbers, negative.
namespace LinuxStatus {
inline constexpr std::int32_t Success = 0;
inline constexpr std::int32_t NoEntry = -2;            // ENOENT: unlinked
inline constexpr std::int32_t NoDevice = -19;          // ENODEV
inline constexpr std::int32_t BrokenPipe = -32;        // EPIPE: stalled
inline constexpr std::int32_t ProtocolError = -71;     // EPROTO
inline constexpr std::int32_t Overflow = -75;          // EOVERFLOW
inline constexpr std::int32_t ConnectionReset = -104;  // ECONNRESET: unlinked
inline constexpr std::int32_t Shutdown = -108;         // ESHUTDOWN
}  // namespace LinuxStatus

std::int32_t StatusOf(TransferStatus status);
TransferStatus TransferStatusOf(std::int32_t status);

}  // namespace Varnholt::Platform::Usb::UsbIp
