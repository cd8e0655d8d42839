#include "Platform/Usb/UsbIpProtocol.h"

#include <algorithm>
#include <utility>

#include "Platform/LookUp.h"
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
    Writer& Big16(auto value) { return Put(Protocol::StoreBig16, value); }
    Writer& Big32(auto value) { return Put(Protocol::StoreBig32, value); }
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
    template <class Number, class Value>
    Writer& Put(void (*store)(std::uint8_t*, Number), Value value) {
        if (const auto field = Take(sizeof(Number)); !field.empty()) {
            store(field.data(), static_cast<Number>(value));
        }
        return *this;
    }
};

class Reader final : Cursor<const std::uint8_t> {
  public:
    explicit Reader(std::span<const std::uint8_t> message) : Cursor(message) {}

    Reader& Byte(std::uint8_t& value) {
        return Get(
            +[](const std::uint8_t* field) { return *field; }, value);
    }
    Reader& Big16(auto& value) { return Get(Protocol::LoadBig16, value); }
    Reader& Big32(auto& value) { return Get(Protocol::LoadBig32, value); }
    Reader& Little16(std::uint16_t& value) { return Get(Protocol::LoadLittle16, value); }
    Reader& Text(std::string& text, std::size_t size) {
        const auto field = Take(size);
        text.assign(field.begin(), std::ranges::find(field, std::uint8_t{0}));
        return *this;
    }

  private:
    template <class Number, class Value>
    Reader& Get(Number (*load)(const std::uint8_t*), Value& value) {
        const auto field = Take(sizeof(Number));
        value = static_cast<Value>(field.empty() ? Number{0} : load(field.data()));
        return *this;
    }
};

enum class Command : std::uint32_t { Submit = 1, Unlink = 2, SubmitReply = 3, UnlinkReply = 4 };

constexpr std::uint32_t Out = 0;
constexpr std::uint32_t In = 1;
constexpr std::uint32_t HighestEndpoint = 15;
/// Packets of an isochronous transfer; other transfers have none, which is written in two ways.
constexpr std::uint32_t NotIsochronous = 0xFFFFFFFF;
constexpr std::uint32_t FlagIn = 0x200;

/// The first of a status is the one that is sent.
constexpr std::pair<std::int32_t, TransferStatus> Statuses[] = {
    {LinuxStatus::Success, TransferStatus::Completed},
    {LinuxStatus::BrokenPipe, TransferStatus::Stalled},
    {LinuxStatus::ProtocolError, TransferStatus::IoError},
    {LinuxStatus::Overflow, TransferStatus::Overflow},
    {LinuxStatus::ConnectionReset, TransferStatus::Cancelled},
    {LinuxStatus::NoEntry, TransferStatus::Cancelled},
    {LinuxStatus::NoDevice, TransferStatus::DeviceGone},
    {LinuxStatus::Shutdown, TransferStatus::DeviceGone},
};

/// What every packet begins with.
struct Beginning {
    Command command;
    std::uint32_t sequence;
    std::uint32_t deviceId = 0;
    std::uint32_t direction = Out;
    std::uint32_t endpoint = 0;
};

/// What a submission has beside the numbers of its packet.
struct Framing {
    std::uint32_t flags = 0;
    std::uint32_t startFrame = 0;
    std::uint32_t packets = 0;
};

// The fields of the messages in their order, for a writer and for a reader alike.

void HeaderFields(auto message, auto& header) {
    message.Big16(header.version).Big16(header.operation).Big32(header.status);
}

void RecordFields(auto message, auto& record) {
    message.Text(record.path, PathSize).Text(record.busId, BusIdSize);
    message.Big32(record.busNumber).Big32(record.deviceNumber).Big32(record.speed);
    message.Big16(record.vendorId).Big16(record.productId).Big16(record.version);
    message.Byte(record.classes[0]).Byte(record.classes[1]).Byte(record.classes[2]);
    message.Byte(record.configurationValue).Byte(record.configurations).Byte(record.interfaces);
}

void BeginningFields(auto& message, auto&& beginning) {
    message.Big32(beginning.command).Big32(beginning.sequence).Big32(beginning.deviceId);
    message.Big32(beginning.direction).Big32(beginning.endpoint);
}

void SubmissionFields(auto& message, auto& packet, auto&& framing) {
    message.Big32(framing.flags).Big32(packet.length).Big32(framing.startFrame);
    message.Big32(framing.packets).Big32(packet.interval);
    message.Byte(packet.setup.requestType).Byte(packet.setup.request).Little16(packet.setup.value);
    message.Little16(packet.setup.index).Little16(packet.setup.length);
}

void Write(Writer& message, const SubmitPacket& packet) {
    BeginningFields(message, Beginning{Command::Submit, packet.sequence, packet.deviceId,
                                       packet.in ? In : Out, packet.endpoint & HighestEndpoint});
    SubmissionFields(message, packet, Framing{.flags = packet.in ? FlagIn : 0});
}
void Write(Writer& message, const UnlinkPacket& packet) {
    BeginningFields(message, Beginning{Command::Unlink, packet.sequence, packet.deviceId});
    message.Big32(packet.victim);
}
void Write(Writer& message, const SubmitReply& reply) {
    BeginningFields(message, Beginning{Command::SubmitReply, reply.sequence});
    message.Big32(reply.status).Big32(reply.actualLength);
}
void Write(Writer& message, const UnlinkReply& reply) {
    BeginningFields(message, Beginning{Command::UnlinkReply, reply.sequence});
    message.Big32(reply.status);
}

std::optional<Packet> ReadSubmit(Reader& message, const Beginning& beginning) {
    SubmitPacket packet;
    Framing framing;  // its flags only repeat the direction
    SubmissionFields(message, packet, framing);
    if (beginning.direction > In || beginning.endpoint > HighestEndpoint || packet.length > MaximumPayload ||
        (framing.packets != 0 && framing.packets != NotIsochronous)) {
        return std::nullopt;
    }
    packet.sequence = beginning.sequence;
    packet.deviceId = beginning.deviceId;
    packet.in = beginning.direction == In;
    const std::uint32_t direction = beginning.endpoint != 0 && packet.in ? 0x80 : 0;
    packet.endpoint = static_cast<std::uint8_t>(beginning.endpoint | direction);
    return packet;
}

}  // namespace

OperationBytes Encode(const OperationHeader& header) {
    OperationBytes bytes{};
    HeaderFields(Writer(bytes), header);
    return bytes;
}

OperationHeader DecodeOperation(std::span<const std::uint8_t, OperationHeaderSize> bytes) {
    OperationHeader header;
    HeaderFields(Reader(bytes), header);
    return header;
}

DeviceRecordBytes Encode(const DeviceRecord& record) {
    DeviceRecordBytes bytes{};
    RecordFields(Writer(bytes), record);
    return bytes;
}

DeviceRecord DecodeDeviceRecord(std::span<const std::uint8_t, DeviceRecordSize> bytes) {
    DeviceRecord record;
    RecordFields(Reader(bytes), record);
    return record;
}

BusIdBytes EncodeBusId(const std::string& busId) {
    BusIdBytes bytes{};
    Writer(bytes).Text(busId, BusIdSize);
    return bytes;
}

std::string DecodeBusId(std::span<const std::uint8_t, BusIdSize> bytes) {
    std::string busId;
    Reader(bytes).Text(busId, BusIdSize);
    return busId;
}

PacketBytes Encode(const Packet& packet) {
    PacketBytes bytes{};
    Writer message(bytes);
    std::visit([&message](const auto& kind) { Write(message, kind); }, packet);
    return bytes;
}

std::optional<Packet> DecodePacket(std::span<const std::uint8_t, PacketHeaderSize> bytes) {
    Reader message(bytes);
    Beginning beginning{};
    BeginningFields(message, beginning);
    switch (beginning.command) {
        case Command::Submit:
            return ReadSubmit(message, beginning);
        case Command::Unlink: {
            UnlinkPacket packet{beginning.sequence, beginning.deviceId};
            message.Big32(packet.victim);
            return packet;
        }
        case Command::SubmitReply: {
            SubmitReply reply{beginning.sequence};
            message.Big32(reply.status).Big32(reply.actualLength);
            return reply.actualLength <= MaximumPayload ? std::optional<Packet>(reply) : std::nullopt;
        }
        case Command::UnlinkReply: {
            UnlinkReply reply{beginning.sequence};
            message.Big32(reply.status);
            return reply;
        }
    }
    return std::nullopt;
}

std::int32_t StatusOf(TransferStatus status) {
    return std::ranges::find(Statuses, status, &std::pair<std::int32_t, TransferStatus>::second)->first;
}

TransferStatus TransferStatusOf(std::int32_t status) {
    return LookUp(Statuses, status, TransferStatus::IoError);
}

}  // namespace Varnholt::Platform::Usb::UsbIp
