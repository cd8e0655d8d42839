#include "Platform/Usb/UsbIpProtocol.h"

#include <algorithm>

#include "Protocol/ByteOrder.h"

namespace Varnholt::Platform::Usb::UsbIp {
namespace {

/// Walks over a message of fixed size, field by field. Fields beyond its end are not written and read as 0.
template <class Byte>
class Cursor {
  protected:
    explicit Cursor(std::span<Byte> message) : rest_(message) {}

    std::span<Byte> Take(std::size_t size) {
        if (size > rest_.size()) {
            rest_ = {};
            return {};
        }
        const auto field = rest_.first(size);
        rest_ = rest_.subspan(size);
        return field;
    }

  private:
    std::span<Byte> rest_;
};

class Writer final : Cursor<std::uint8_t> {
  public:
    explicit Writer(std::span<std::uint8_t> message) : Cursor(message) {}

    Writer& Byte(std::uint8_t value) {
        return Put(
            +[](std::uint8_t* field, std::uint8_t byte) { *field = byte; }, value);
    }
    Writer& Big16(std::uint16_t value) { return Put(Protocol::StoreBig16, value); }
    Writer& Big32(std::uint32_t value) { return Put(Protocol::StoreBig32, value); }
    Writer& Little16(std::uint16_t value) { return Put(Protocol::StoreLittle16, value); }
    /// Zero-terminated, padded with zeros.
    Writer& Text(const std::string& text, std::size_t size) {
        const auto field = Take(size);
        std::ranges::fill(field, std::uint8_t{0});
        if (!field.empty()) {
            std::copy_n(text.begin(), std::min(text.size(), size - 1), field.begin());
        }
        return *this;
    }

  private:
    template <class Value>
    Writer& Put(void (*store)(std::uint8_t*, Value), Value value) {
        if (const auto field = Take(sizeof value); !field.empty()) {
            store(field.data(), value);
        }
        return *this;
    }
};

class Reader final : Cursor<const std::uint8_t> {
  public:
    explicit Reader(std::span<const std::uint8_t> message) : Cursor(message) {}

    std::uint8_t Byte() {
        return Get(+[](const std::uint8_t* field) { return *field; });
    }
    std::uint16_t Big16() { return Get(Protocol::LoadBig16); }
    std::uint32_t Big32() { return Get(Protocol::LoadBig32); }
    std::uint16_t Little16() { return Get(Protocol::LoadLittle16); }
    std::string Text(std::size_t size) {
        const auto field = Take(size);
        return {field.begin(), std::ranges::find(field, std::uint8_t{0})};
    }

  private:
    template <class Value>
    Value Get(Value (*load)(const std::uint8_t*)) {
        const auto field = Take(sizeof(Value));
        return field.empty() ? Value{0} : load(field.data());
    }
};

enum class Command : std::uint32_t { Submit = 1, Unlink = 2, SubmitReply = 3, UnlinkReply = 4 };

constexpr std::uint32_t Out = 0;
constexpr std::uint32_t In = 1;
constexpr std::uint32_t HighestEndpoint = 15;
/// Packets of an isochronous transfer; other transfers have none, which is written in two ways.
constexpr std::uint32_t NotIsochronous = 0xFFFFFFFF;
constexpr std::uint32_t FlagIn = 0x200;

struct StatusNumber {
    std::int32_t number;
    TransferStatus status;
};
/// The first of a status is the one that is sent.
constexpr std::array StatusNumbers{
    StatusNumber{LinuxStatus::Success, TransferStatus::Completed},
    StatusNumber{LinuxStatus::BrokenPipe, TransferStatus::Stalled},
    StatusNumber{LinuxStatus::ProtocolError, TransferStatus::IoError},
    StatusNumber{LinuxStatus::Overflow, TransferStatus::Overflow},
    StatusNumber{LinuxStatus::ConnectionReset, TransferStatus::Cancelled},
    StatusNumber{LinuxStatus::NoEntry, TransferStatus::Cancelled},
    StatusNumber{LinuxStatus::NoDevice, TransferStatus::DeviceGone},
    StatusNumber{LinuxStatus::Shutdown, TransferStatus::DeviceGone},
};

void WriteCommon(Writer& writer, Command command, std::uint32_t sequence, std::uint32_t deviceId = 0,
                 std::uint32_t direction = Out, std::uint32_t endpoint = 0) {
    writer.Big32(static_cast<std::uint32_t>(command)).Big32(sequence).Big32(deviceId);
    writer.Big32(direction).Big32(endpoint);
}

void Write(Writer& writer, const SubmitPacket& packet) {
    WriteCommon(writer, Command::Submit, packet.sequence, packet.deviceId, packet.in ? In : Out,
                packet.endpoint & HighestEndpoint);
    writer.Big32(packet.in ? FlagIn : 0).Big32(packet.length).Big32(0).Big32(0).Big32(packet.interval);
    writer.Byte(packet.setup.requestType).Byte(packet.setup.request).Little16(packet.setup.value);
    writer.Little16(packet.setup.index).Little16(packet.setup.length);
}
void Write(Writer& writer, const UnlinkPacket& packet) {
    WriteCommon(writer, Command::Unlink, packet.sequence, packet.deviceId);
    writer.Big32(packet.victim);
}
void Write(Writer& writer, const SubmitReply& reply) {
    WriteCommon(writer, Command::SubmitReply, reply.sequence);
    writer.Big32(static_cast<std::uint32_t>(reply.status)).Big32(reply.actualLength);
}
void Write(Writer& writer, const UnlinkReply& reply) {
    WriteCommon(writer, Command::UnlinkReply, reply.sequence);
    writer.Big32(static_cast<std::uint32_t>(reply.status));
}

std::optional<Packet> ReadSubmit(Reader& reader, SubmitPacket packet, std::uint32_t direction,
                                 std::uint32_t endpoint) {
    reader.Big32();  // flags: the direction is known already
    packet.length = reader.Big32();
    reader.Big32();  // start frame
    const std::uint32_t packets = reader.Big32();
    packet.interval = reader.Big32();
    packet.setup.requestType = reader.Byte();
    packet.setup.request = reader.Byte();
    packet.setup.value = reader.Little16();
    packet.setup.index = reader.Little16();
    packet.setup.length = reader.Little16();
    if (direction > In || endpoint > HighestEndpoint || packet.length > MaximumPayload ||
        (packets != 0 && packets != NotIsochronous)) {
        return std::nullopt;
    }
    packet.in = direction == In;
    packet.endpoint = static_cast<std::uint8_t>(endpoint != 0 && packet.in ? endpoint | 0x80 : endpoint);
    return packet;
}

}  // namespace

OperationBytes Encode(const OperationHeader& header) {
    OperationBytes bytes{};
    Writer(bytes)
        .Big16(header.version)
        .Big16(static_cast<std::uint16_t>(header.operation))
        .Big32(static_cast<std::uint32_t>(header.status));
    return bytes;
}

OperationHeader DecodeOperation(std::span<const std::uint8_t, OperationHeaderSize> bytes) {
    Reader reader(bytes);
    OperationHeader header;
    header.version = reader.Big16();
    header.operation = static_cast<Operation>(reader.Big16());
    header.status = static_cast<OperationStatus>(reader.Big32());
    return header;
}

DeviceRecordBytes Encode(const DeviceRecord& record) {
    DeviceRecordBytes bytes{};
    Writer writer(bytes);
    writer.Text(record.path, PathSize).Text(record.busId, BusIdSize);
    writer.Big32(record.busNumber).Big32(record.deviceNumber).Big32(record.speed);
    writer.Big16(record.vendorId).Big16(record.productId).Big16(record.version);
    writer.Byte(record.classes[0]).Byte(record.classes[1]).Byte(record.classes[2]);
    writer.Byte(record.configurationValue).Byte(record.configurations).Byte(record.interfaces);
    return bytes;
}

DeviceRecord DecodeDeviceRecord(std::span<const std::uint8_t, DeviceRecordSize> bytes) {
    Reader reader(bytes);
    DeviceRecord record;
    record.path = reader.Text(PathSize);
    record.busId = reader.Text(BusIdSize);
    record.busNumber = reader.Big32();
    record.deviceNumber = reader.Big32();
    record.speed = reader.Big32();
    record.vendorId = reader.Big16();
    record.productId = reader.Big16();
    record.version = reader.Big16();
    for (std::uint8_t& number : record.classes) {
        number = reader.Byte();
    }
    record.configurationValue = reader.Byte();
    record.configurations = reader.Byte();
    record.interfaces = reader.Byte();
    return record;
}

BusIdBytes EncodeBusId(const std::string& busId) {
    BusIdBytes bytes{};
    Writer(bytes).Text(busId, BusIdSize);
    return bytes;
}

std::string DecodeBusId(std::span<const std::uint8_t, BusIdSize> bytes) {
    return Reader(bytes).Text(BusIdSize);
}

PacketBytes Encode(const Packet& packet) {
    PacketBytes bytes{};
    Writer writer(bytes);
    std::visit([&writer](const auto& kind) { Write(writer, kind); }, packet);
    return bytes;
}

std::optional<Packet> DecodePacket(std::span<const std::uint8_t, PacketHeaderSize> bytes) {
    Reader reader(bytes);
    const auto command = static_cast<Command>(reader.Big32());
    const std::uint32_t sequence = reader.Big32();
    const std::uint32_t deviceId = reader.Big32();
    const std::uint32_t direction = reader.Big32();
    const std::uint32_t endpoint = reader.Big32();
    switch (command) {
        case Command::Submit: {
            SubmitPacket packet;
            packet.sequence = sequence;
            packet.deviceId = deviceId;
            return ReadSubmit(reader, packet, direction, endpoint);
        }
        case Command::Unlink:
            return UnlinkPacket{sequence, deviceId, reader.Big32()};
        case Command::SubmitReply: {
            SubmitReply reply{sequence, static_cast<std::int32_t>(reader.Big32()), 0};
            reply.actualLength = reader.Big32();
            return reply.actualLength <= MaximumPayload ? std::optional<Packet>(reply) : std::nullopt;
        }
        case Command::UnlinkReply:
            return UnlinkReply{sequence, static_cast<std::int32_t>(reader.Big32())};
    }
    return std::nullopt;
}

std::int32_t StatusOf(TransferStatus status) {
    return std::ranges::find(StatusNumbers, status, &StatusNumber::status)->number;
}

TransferStatus TransferStatusOf(std::int32_t status) {
    const auto known = std::ranges::find(StatusNumbers, status, &StatusNumber::number);
    return known == StatusNumbers.end() ? TransferStatus::IoError : known->status;
}

}  // namespace Varnholt::Platform::Usb::UsbIp
