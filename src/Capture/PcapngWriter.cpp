#include "Capture/PcapngWriter.h"

#include <algorithm>
#include <chrono>
#include <concepts>
#include <vector>

#include "Platform/Usb/UsbIpProtocol.h"
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

/// Of the header in front of each packet's data.
constexpr std::size_t UsbmonHeaderSize = 64;
constexpr std::uint8_t TransferTypeInterrupt = 1;
constexpr std::uint8_t TransferTypeControl = 2;
constexpr std::uint8_t TransferTypeBulk = 3;
constexpr std::uint16_t BusNumber = 1;
constexpr std::int32_t StatusInProgress = -115;

/// Grows a block; numbers are little-endian, as the byte-order magic says.
class Bytes {
  public:
    template <std::unsigned_integral Number>
    void Put(Number value) {
        for (std::size_t i = 0; i < sizeof value; ++i) {
            bytes.push_back(static_cast<std::uint8_t>(value >> (8 * i)));
        }
    }
    void Append(std::span<const std::uint8_t> data) { bytes.insert(bytes.end(), data.begin(), data.end()); }
    void PadToWord() { bytes.resize((bytes.size() + 3) / 4 * 4); }
    /// The block's only option.
    void PutOption(std::uint16_t code, const std::string& text) {
        const auto length = static_cast<std::uint16_t>(std::min<std::size_t>(text.size(), 0xFFFF));
        Put(code);
        Put(length);
        bytes.insert(bytes.end(), text.begin(), text.begin() + length);
        PadToWord();
        Put(std::uint32_t{OptionEnd});
    }

    std::vector<std::uint8_t> bytes;
};

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

/// The header that usbmon puts in front of a packet's data, and the data.
Bytes UsbmonPacket(const PcapngWriter::Packet& packet, std::uint64_t microseconds) {
    const Usb::Transfer& transfer = *packet.transfer;
    const bool isIn = transfer.IsIn();
    const bool hasSetup = transfer.endpoint == 0 && !packet.completion;
    const bool hasData = packet.completion == isIn;
    const std::uint32_t urbLength = packet.completion ? transfer.actualLength : transfer.length;
    const std::uint32_t dataLength = hasData ? urbLength : 0;
    const std::int32_t status = packet.completion ? KernelStatus(transfer.status) : StatusInProgress;
    const Usb::SetupPacket setup = hasSetup ? transfer.setup : Usb::SetupPacket{};
    const auto letter = [](char c) { return static_cast<std::uint8_t>(c); };

    Bytes written;
    written.Put(packet.transferId);
    written.Put(letter(packet.completion ? 'C' : 'S'));
    written.Put(TransferType(transfer.endpoint));
    written.Put(static_cast<std::uint8_t>(transfer.endpoint | (isIn ? 0x80 : 0)));
    written.Put(packet.deviceNumber);
    written.Put(BusNumber);
    written.Put(letter(hasSetup ? '\0' : '-'));
    written.Put(letter(dataLength > 0 ? '\0' : isIn ? '<' : '>'));
    written.Put(microseconds / 1'000'000);
    written.Put(static_cast<std::uint32_t>(microseconds % 1'000'000));
    written.Put(static_cast<std::uint32_t>(status));
    written.Put(urbLength);
    written.Put(dataLength);
    written.Put(setup.requestType);
    written.Put(setup.request);
    written.Put(setup.value);
    written.Put(setup.index);
    written.Put(setup.length);
    written.bytes.resize(UsbmonHeaderSize);  // what remains is for isochronous transfers
    written.Append({transfer.data, dataLength});
    return written;
}

}  // namespace

PcapngWriter::PcapngWriter(const std::string& fileName, const std::string& application)
    : file_(fileName, std::ios::binary | std::ios::trunc) {
    Bytes section;
    section.Put(ByteOrderMagic);
    section.Put(std::uint16_t{1});  // version 1.0
    section.Put(std::uint16_t{0});
    section.Put(~std::uint64_t{0});  // section length not given
    section.PutOption(OptionUserApplication, application);
    WriteBlock(SectionHeaderBlock, section.bytes);

    Bytes interface;
    interface.Put(LinkTypeUsbLinuxMmapped);
    interface.Put(std::uint16_t{0});
    // Packets are not cut; time stamps count microseconds where nothing else is said.
    interface.Put(std::uint32_t{0});
    WriteBlock(InterfaceDescriptionBlock, interface.bytes);
    file_.flush();
}

void PcapngWriter::Write(const Packet& packet) {
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    const auto microseconds =
        static_cast<std::uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(now).count());
    const std::vector<std::uint8_t> data = UsbmonPacket(packet, microseconds).bytes;
    const auto size = static_cast<std::uint32_t>(data.size());
    Bytes block;
    block.Put(std::uint32_t{0});  // interface
    block.Put(static_cast<std::uint32_t>(microseconds >> 32));
    block.Put(static_cast<std::uint32_t>(microseconds));
    block.Put(size);
    block.Put(size);
    block.Append(data);
    block.PadToWord();
    if (!packet.comment.empty()) {
        block.PutOption(OptionComment, packet.comment);
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
    const auto length = static_cast<std::uint32_t>(body.size() + 12);
    Bytes block;
    block.Put(type);
    block.Put(length);
    block.Append(body);
    block.Put(length);
    file_.write(reinterpret_cast<const char*>(block.bytes.data()),
                static_cast<std::streamsize>(block.bytes.size()));
}

}  // namespace Varnholt::Capture
