#include "UsbIpSession.h"

#include <algorithm>
#include <utility>

#include "Protocol/ByteOrder.h"

namespace Varnholt::Simulator {

namespace UsbIp = Platform::Usb::UsbIp;
namespace Errors = Platform::Errors;
using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;
using Platform::Usb::UsbDevice;

/// A transfer that the peer has submitted.
struct UsbIpSession::Urb : Transfer {
    std::uint32_t sequence = 0;
    bool sendsData = false;                   // its reply has a payload
    std::optional<std::uint32_t> unlinkedBy;  // the sequence number of the packet that ends it
    std::vector<std::uint8_t> buffer;
};

UsbIpSession::UsbIpSession(UsbIpExports& exportedDevices, std::function<void()> outputReady)
    : exports(&exportedDevices), notify(std::move(outputReady)) {
    Expect(&UsbIpSession::HandleOperation, UsbIp::OperationHeaderSize);
}

UsbIpSession::UsbIpSession(std::shared_ptr<UsbDevice> importedDevice, std::function<void()> outputReady)
    : exports(nullptr), notify(std::move(outputReady)), device(std::move(importedDevice)) {
    Expect(&UsbIpSession::HandlePacketHeader, UsbIp::PacketHeaderSize);
}

UsbIpSession::~UsbIpSession() {
    over = true;
    device.reset();  // ends what is still under way
}

void UsbIpSession::Expect(void (UsbIpSession::*handler)(), std::size_t bytes) {
    input.clear();
    expected = bytes;
    next = handler;
}

std::size_t UsbIpSession::Receive(std::span<const std::uint8_t> bytes) {
    const std::size_t offered = bytes.size();
    while (!bytes.empty() && WantsInput()) {
        const std::size_t count = std::min(bytes.size(), expected - input.size());
        input.insert(input.end(), bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(count));
        bytes = bytes.subspan(count);
        if (input.size() == expected) {
            (this->*next)();
        }
    }
    return offered - bytes.size();
}

void UsbIpSession::OutputSent(std::size_t count) {
    sent += count;
    if (sent == output.size()) {
        output.clear();
        sent = 0;
    }
}

void UsbIpSession::Send(std::span<const std::uint8_t> bytes) {
    if (sent > MostOutput) {
        output.erase(output.begin(), output.begin() + static_cast<std::ptrdiff_t>(sent));
        sent = 0;
    }
    output.insert(output.end(), bytes.begin(), bytes.end());
}

void UsbIpSession::End(const std::string& reason) {
    if (!std::exchange(over, true)) {
        complaint = reason;
    }
    notify();
}

void UsbIpSession::HandleOperation() {
    const auto header = UsbIp::DecodeOperation(std::span(input).first<UsbIp::OperationHeaderSize>());
    if (header.version != UsbIp::ProtocolVersion) {
        End("not USB/IP, or another version of it");
    } else if (header.operation == UsbIp::Operation::ListRequest) {
        SendDeviceList();
        End();
    } else if (header.operation == UsbIp::Operation::ImportRequest) {
        Expect(&UsbIpSession::HandleImport, UsbIp::BusIdSize);
    } else {
        End("unknown operation");
    }
}

void UsbIpSession::SendDeviceList() {
    const std::vector<UsbIp::DeviceRecord> records = exports->List();
    UsbIp::OperationHeader header;
    header.operation = UsbIp::Operation::ListReply;
    Send(UsbIp::Encode(header));
    std::array<std::uint8_t, UsbIp::ListCountSize> count{};
    Protocol::StoreBig32(count.data(), static_cast<std::uint32_t>(records.size()));
    Send(count);
    for (const UsbIp::DeviceRecord& record : records) {
        Send(UsbIp::Encode(record));
        for (unsigned interface = 0; interface < record.interfaces; ++interface) {
            const std::array<std::uint8_t, UsbIp::InterfaceRecordSize> vendorInterface{record.classes[0]};
            Send(vendorInterface);
        }
    }
}

void UsbIpSession::HandleImport() {
    const std::string busId = UsbIp::DecodeBusId(std::span(input).first<UsbIp::BusIdSize>());
    UsbIpExports::Import import = exports->ImportDevice(busId);
    UsbIp::OperationHeader header;
    header.operation = UsbIp::Operation::ImportReply;
    header.status = import.status;
    Send(UsbIp::Encode(header));
    if (import.status != UsbIp::OperationStatus::Ok) {
        End("import of " + busId + " refused");
        return;
    }
    Send(UsbIp::Encode(import.record));
    device = std::move(import.device);
    Expect(&UsbIpSession::HandlePacketHeader, UsbIp::PacketHeaderSize);
    notify();
}

void UsbIpSession::HandlePacketHeader() {
    const auto packet = UsbIp::DecodePacket(std::span(input).first<UsbIp::PacketHeaderSize>());
    if (packet && std::holds_alternative<UsbIp::UnlinkPacket>(*packet)) {
        Expect(&UsbIpSession::HandlePacketHeader, UsbIp::PacketHeaderSize);
        Unlink(std::get<UsbIp::UnlinkPacket>(*packet));
    } else if (packet && std::holds_alternative<UsbIp::SubmitPacket>(*packet)) {
        submit = std::get<UsbIp::SubmitPacket>(*packet);
        if (!submit.in && submit.length > 0) {
            Expect(&UsbIpSession::SubmitPacket, submit.length);
        } else {
            input.clear();
            SubmitPacket();
        }
    } else {
        End("broken packet");
    }
}

void UsbIpSession::SubmitPacket() {
    if (urbs.contains(submit.sequence) || urbs.size() >= MostTransfers ||
        pendingBytes + submit.length > MostPendingBytes) {
        End("too many transfers, or two with one number");
        return;
    }
    auto owned = std::make_unique<Urb>();
    Urb& urb = *owned;
    urb.sequence = submit.sequence;
    urb.sendsData = submit.in;
    urb.buffer = std::exchange(input, {});
    urb.buffer.resize(submit.length);
    urb.endpoint = submit.endpoint;
    urb.setup = submit.setup;
    urb.data = urb.buffer.data();
    urb.length = submit.length;
    urb.client = this;
    Expect(&UsbIpSession::HandlePacketHeader, UsbIp::PacketHeaderSize);

    urbs[urb.sequence] = std::move(owned);
    pendingBytes += urb.length;
    const Platform::ErrorCode code = device->Submit(urb);
    if (code == Errors::Success) {
        return;
    }
    urb.status = code == Errors::DeviceNotConnected ? TransferStatus::DeviceGone : TransferStatus::Stalled;
    urb.actualLength = 0;
    TransferCompleted(urb);
}

void UsbIpSession::Unlink(const UsbIp::UnlinkPacket& packet) {
    const auto victim = urbs.find(packet.victim);
    if (victim == urbs.end()) {
        Send(UsbIp::Encode(UsbIp::UnlinkReply{packet.sequence, 0}));
        notify();
        return;
    }
    Urb& urb = *victim->second;
    urb.unlinkedBy = packet.sequence;
    device->Cancel(urb);
}

void UsbIpSession::TransferCompleted(Transfer& transfer) noexcept {
    auto& urb = static_cast<Urb&>(transfer);
    const std::unique_ptr<Urb> finished = std::move(urbs.extract(urb.sequence).mapped());
    pendingBytes -= urb.length;
    if (over) {
        return;
    }
    if (urb.status == TransferStatus::DeviceGone) {
        End("instrument unplugged");  // the peer learns of it by the end of the connection
        return;
    }
    // A transfer that ends with its cancellation and without data is answered by that alone.
    if (urb.unlinkedBy && urb.status == TransferStatus::Cancelled && urb.actualLength == 0) {
        Send(UsbIp::Encode(UsbIp::UnlinkReply{*urb.unlinkedBy, UsbIp::StatusOf(TransferStatus::Cancelled)}));
    } else {
        Send(UsbIp::Encode(UsbIp::SubmitReply{urb.sequence, UsbIp::StatusOf(urb.status), urb.actualLength}));
        if (urb.sendsData) {
            Send({urb.data, urb.actualLength});
        }
        if (urb.unlinkedBy) {
            Send(UsbIp::Encode(UsbIp::UnlinkReply{*urb.unlinkedBy, 0}));
        }
    }
    notify();
}

}  // namespace Varnholt::Simulator
