#include "Capture/PcapngWriter.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <vector>

#include "Platform/Usb/UsbIpProtocol.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Capture {
namespace {

constexpr std::uint32_t SectionHeaderBlock = 0x0A0D0D0A;
constexpr std::uint32_t InterfaceDescriptionBlock = 1;
constexpr std::uint32_t EnhancedPacketBlock = 6;
constexpr std::uint32_t ByteOrderMagic = 0x1A2B3C4D;
constexpr std::uint16_t LinkTypeUsbLinuxMmapped = 220;
constexpr std::uint16_t OptionEnd = 0;
constexpr std::uint16_t OptionComment = 1;
constexpr std::uint16_t OptionUserApplication = 4;

/// The header in front of each packet's data.
namespace Usbmon {
constexpr std::size_t Id = 0;
constexpr std::size_t EventType = 8;
constexpr std::size_t TransferType = 9;
constexpr std::size_t Endpoint = 10;
constexpr std::size_t Device = 11;
constexpr std::size_t Bus = 12;
constexpr std::size_t SetupFlag = 14;
constexpr std::size_t DataFlag = 15;
constexpr std::size_t Seconds = 16;
constexpr std::size_t Microseconds = 24;
constexpr std::size_t Status = 28;
constexpr std::size_t UrbLength = 32;
constexpr std::size_t DataLength = 36;
constexpr std::size_t Setup = 40;
constexpr std::size_t HeaderSize = 64;
}  // namespace Usbmon
constexpr std::uint8_t TransferTypeInterrupt = 1;
constexpr std::uint8_t TransferTypeControl = 2;
constexpr std::uint8_t TransferTypeBulk = 3;
constexpr std::uint16_t BusNumber = 1;
constexpr std::int32_t StatusInProgress = -115;

/// Grows a block; numbers are little-endian, as the byte-order magic says.
class Bytes {
  public:
    void Put16(std::uint16_t value) {
        std::array<std::uint8_t, 2> stored;
        Protocol::StoreLittle16(stored.data(), value);
        Append(stored);
    }
    void Put32(std::uint32_t value) {
        std::array<std::uint8_t, 4> stored;
        Protocol::StoreLittle32(stored.data(), value);
        Append(stored);
    }
    void Append(std::span<const std::uint8_t> data) { bytes.insert(bytes.end(), data.begin(), data.end()); }
    void PadToWord() { bytes.resize((bytes.size() + 3) / 4 * 4); }
    void PutOption(std::uint16_t code, const std::string& text) {
        const std::size_t length = std::min<std::size_t>(text.size(), 0xFFFF);
        Put16(code);
        Put16(static_cast<std::uint16_t>(length));
        bytes.insert(bytes.end(), text.begin(), text.begin() + static_cast<std::ptrdiff_t>(length));
        PadToWord();
    }
    void EndOptions() { Put32(OptionEnd); }

    std::vector<std::uint8_t> bytes;
};

void Store64(std::uint8_t* bytes, std::uint64_t value) {
    Protocol::StoreLittle32(bytes, static_cast<std::uint32_t>(value));
    Protocol::StoreLittle32(bytes + 4, static_cast<std::uint32_t>(value >> 32));
}

/// The kernel calls a device that went under a transfer shut down.
std::int32_t KernelStatus(Usb::TransferStatus status) {
    namespace UsbIp = Usb::UsbIp;
    return status == Usb::TransferStatus::DeviceGone ? UsbIp::LinuxStatus::Shutdown : UsbIp::StatusOf(status);
}

std::uint8_t TransferType(std::uint8_t endpoint) {
    if (endpoint == 0) {
        return TransferTypeControl;
    }
    return endpoint == Protocol::InterruptInEndpoint ? TransferTypeInterrupt : TransferTypeBulk;
}

std::vector<std::uint8_t> UsbmonPacket(const PcapngWriter::Packet& packet, std::uint64_t microseconds) {
    const Usb::Transfer& transfer = *packet.transfer;
    const bool isIn = transfer.IsIn();
    const bool hasData = packet.completion == isIn;
    const std::uint32_t urbLength = packet.completion ? transfer.actualLength : transfer.length;
    const std::uint32_t dataLength = hasData ? urbLength : 0;

    std::vector<std::uint8_t> bytes(Usbmon::HeaderSize);
    Store64(&bytes[Usbmon::Id], packet.transferId);
    bytes[Usbmon::EventType] = packet.completion ? 'C' : 'S';
    bytes[Usbmon::TransferType] = TransferType(transfer.endpoint);
    bytes[Usbmon::Endpoint] = static_cast<std::uint8_t>(transfer.endpoint | (isIn ? 0x80 : 0));
    bytes[Usbmon::Device] = packet.deviceNumber;
    Protocol::StoreLittle16(&bytes[Usbmon::Bus], BusNumber);
    const bool hasSetup = transfer.endpoint == 0 && !packet.completion;
    bytes[Usbmon::SetupFlag] = hasSetup ? 0 : '-';
    bytes[Usbmon::DataFlag] = dataLength > 0 ? 0 : (isIn ? '<' : '>');
    Store64(&bytes[Usbmon::Seconds], microseconds / 1000000);
    Protocol::StoreLittle32(&bytes[Usbmon::Microseconds], static_cast<std::uint32_t>(microseconds % 1000000));
    const std::int32_t status = packet.completion ? KernelStatus(transfer.status) : StatusInProgress;
    Protocol::StoreLittle32(&bytes[Usbmon::Status], static_cast<std::uint32_t>(status));
    Protocol::StoreLittle32(&bytes[Usbmon::UrbLength], urbLength);
    Protocol::StoreLittle32(&bytes[Usbmon::DataLength], dataLength);
    if (hasSetup) {
        bytes[Usbmon::Setup] = transfer.setup.requestType;
        bytes[Usbmon::Setup + 1] = transfer.setup.request;
        Protocol::StoreLittle16(&bytes[Usbmon::Setup + 2], transfer.setup.value);
        Protocol::StoreLittle16(&bytes[Usbmon::Setup + 4], transfer.setup.index);
        Protocol::StoreLittle16(&bytes[Usbmon::Setup + 6], transfer.setup.length);
    }
    if (dataLength > 0) {
        bytes.insert(bytes.end(), transfer.data, transfer.data + dataLength);
    }
    return bytes;
}

}  // namespace

PcapngWriter::PcapngWriter(const std::string& fileName, const std::string& application)
    : file_(fileName, std::ios::binary | std::ios::trunc) {
    Bytes section;
    section.Put32(ByteOrderMagic);
    section.Put16(1);  // version 1.0
    section.Put16(0);
    section.Put32(0xFFFFFFFF);  // section length not given
    section.Put32(0xFFFFFFFF);
    section.PutOption(OptionUserApplication, application);
    section.EndOptions();
    WriteBlock(SectionHeaderBlock, section.bytes);

    Bytes interface;
    interface.Put16(LinkTypeUsbLinuxMmapped);
    interface.Put16(0);
    interface.Put32(0);  // packets are not cut; time stamps count microseconds where nothing else is said
    WriteBlock(InterfaceDescriptionBlock, interface.bytes);
    file_.flush();
}

void PcapngWriter::Write(const Packet& packet) {
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    const auto microseconds =
        static_cast<std::uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(now).count());
    const std::vector<std::uint8_t> data = UsbmonPacket(packet, microseconds);
    Bytes block;
    block.Put32(0);  // interface
    block.Put32(static_cast<std::uint32_t>(microseconds >> 32));
    block.Put32(static_cast<std::uint32_t>(microseconds));
    block.Put32(static_cast<std::uint32_t>(data.size()));
    block.Put32(static_cast<std::uint32_t>(data.size()));
    block.Append(data);
    block.PadToWord();
    if (!packet.comment.empty()) {
        block.PutOption(OptionComment, packet.comment);
        block.EndOptions();
    }
    const std::lock_guard lock(mutex_);
    WriteBlock(EnhancedPacketBlock, block.bytes);
    file_.flush();
}

bool PcapngWriter::Failed() const {
    const std::lock_guard lock(mutex_);
    return !file_;
}

void PcapngWriter::WriteBlock(std::uint32_t type, std::span<const std::uint8_t> body) {
    std::array<std::uint8_t, 8> head{};
    const auto length = static_cast<std::uint32_t>(body.size() + 12);
    Protocol::StoreLittle32(head.data(), type);
    Protocol::StoreLittle32(&head[4], length);
    const auto put = [this](std::span<const std::uint8_t> bytes) {
        std::ranges::for_each(bytes, [this](std::uint8_t byte) { file_.put(static_cast<char>(byte)); });
    };
    put(head);
    put(body);
    put(std::span(head).subspan(4));
}

}  // namespace Varnholt::Capture
