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
    : exports_(&exportedDevices), notify_(std::move(outputReady)) {
    Expect(&UsbIpSession::HandleOperation, UsbIp::OperationHeaderSize);
}

UsbIpSession::UsbIpSession(std::shared_ptr<UsbDevice> importedDevice, std::function<void()> outputReady)
    : exports_(nullptr), notify_(std::move(outputReady)), device_(std::move(importedDevice)) {
    Expect(&UsbIpSession::HandlePacketHeader, UsbIp::PacketHeaderSize);
}

UsbIpSession::~UsbIpSession() {
    over_ = true;
    device_.reset();  // ends what is still under way
}

void UsbIpSession::Expect(void (UsbIpSession::*handler)(), std::size_t bytes) {
    input_.clear();
    expected_ = bytes;
    next_ = handler;
}

std::size_t UsbIpSession::Receive(std::span<const std::uint8_t> bytes) {
    const std::size_t offered = bytes.size();
    while (!bytes.empty() && WantsInput()) {
        const std::size_t count = std::min(bytes.size(), expected_ - input_.size());
        input_.insert(input_.end(), bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(count));
        bytes = bytes.subspan(count);
        if (input_.size() == expected_) {
            (this->*next_)();
        }
    }
    return offered - bytes.size();
}

void UsbIpSession::OutputSent(std::size_t count) {
    sent_ += count;
    if (sent_ == output_.size()) {
        output_.clear();
        sent_ = 0;
    }
}

void UsbIpSession::Send(std::span<const std::uint8_t> bytes) {
    if (sent_ > MostOutput) {
        output_.erase(output_.begin(), output_.begin() + static_cast<std::ptrdiff_t>(sent_));
        sent_ = 0;
    }
    output_.insert(output_.end(), bytes.begin(), bytes.end());
}

void UsbIpSession::End(const std::string& reason) {
    if (!std::exchange(over_, true)) {
        complaint_ = reason;
    }
    notify_();
}

void UsbIpSession::HandleOperation() {
    const auto header = UsbIp::DecodeOperation(std::span(input_).first<UsbIp::OperationHeaderSize>());
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
    const std::vector<UsbIp::DeviceRecord> records = exports_->List();
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
    const std::string busId = UsbIp::DecodeBusId(std::span(input_).first<UsbIp::BusIdSize>());
    UsbIpExports::Import import = exports_->ImportDevice(busId);
    UsbIp::OperationHeader header;
    header.operation = UsbIp::Operation::ImportReply;
    header.status = import.status;
    Send(UsbIp::Encode(header));
    if (import.status != UsbIp::OperationStatus::Ok) {
        End("import of " + busId + " refused");
        return;
    }
    Send(UsbIp::Encode(import.record));
    device_ = std::move(import.device);
    Expect(&UsbIpSession::HandlePacketHeader, UsbIp::PacketHeaderSize);
    notify_();
}

void UsbIpSession::HandlePacketHeader() {
    const auto packet = UsbIp::DecodePacket(std::span(input_).first<UsbIp::PacketHeaderSize>());
    if (packet && std::holds_alternative<UsbIp::UnlinkPacket>(*packet)) {
        Expect(&UsbIpSession::HandlePacketHeader, UsbIp::PacketHeaderSize);
        Unlink(std::get<UsbIp::UnlinkPacket>(*packet));
    } else if (packet && std::holds_alternative<UsbIp::SubmitPacket>(*packet)) {
        submit_ = std::get<UsbIp::SubmitPacket>(*packet);
        if (!submit_.in && submit_.length > 0) {
            Expect(&UsbIpSession::SubmitPacket, submit_.length);
        } else {
            input_.clear();
            SubmitPacket();
        }
    } else {
        End("broken packet");
    }
}

void UsbIpSession::SubmitPacket() {
    if (urbs_.contains(submit_.sequence) || urbs_.size() >= MostTransfers ||
        pendingBytes_ + submit_.length > MostPendingBytes) {
        End("too many transfers, or two with one number");
        return;
    }
    auto owned = std::make_unique<Urb>();
    Urb& urb = *owned;
    urb.sequence = submit_.sequence;
    urb.sendsData = submit_.in;
    urb.buffer = std::exchange(input_, {});
    urb.buffer.resize(submit_.length);
    urb.endpoint = submit_.endpoint;
    urb.setup = submit_.setup;
    urb.data = urb.buffer.data();
    urb.length = submit_.length;
    urb.client = this;
    Expect(&UsbIpSession::HandlePacketHeader, UsbIp::PacketHeaderSize);

    urbs_[urb.sequence] = std::move(owned);
    pendingBytes_ += urb.length;
    const Platform::ErrorCode code = device_->Submit(urb);
    if (code == Errors::Success) {
        return;
    }
    urb.status = code == Errors::DeviceNotConnected ? TransferStatus::DeviceGone : TransferStatus::Stalled;
    urb.actualLength = 0;
    TransferCompleted(urb);
}

void UsbIpSession::Unlink(const UsbIp::UnlinkPacket& packet) {
    const auto victim = urbs_.find(packet.victim);
    if (victim == urbs_.end()) {
        Send(UsbIp::Encode(UsbIp::UnlinkReply{packet.sequence, 0}));
        notify_();
        return;
    }
    Urb& urb = *victim->second;
    urb.unlinkedBy = packet.sequence;
    device_->Cancel(urb);
}

void UsbIpSession::TransferCompleted(Transfer& transfer) noexcept {
    auto& urb = static_cast<Urb&>(transfer);
    const std::unique_ptr<Urb> finished = std::move(urbs_.extract(urb.sequence).mapped());
    pendingBytes_ -= urb.length;
    if (over_) {
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
    notify_();
}

}  // namespace Varnholt::Simulator
