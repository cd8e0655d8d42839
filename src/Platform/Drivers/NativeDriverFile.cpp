#include "Platform/Drivers/NativeDriverFile.h"

#include <limits>
#include <utility>

#include "Protocol/ByteOrder.h"
#include "Protocol/Instrument.h"
#include "Protocol/NativeDriver.h"

namespace Varnholt::Platform::Drivers {
namespace {

namespace Native = Protocol::NativeDriver;

std::uint8_t EndpointOfPipe(std::uint32_t pipe) {
    switch (pipe) {
        case Native::ReadPipe:
            return Protocol::BulkInEndpoint;
        case Native::WritePipe:
            return Protocol::BulkOutEndpoint;
        case Native::InterruptPipe:
            return Protocol::InterruptInEndpoint;
        default:
            return 0;
    }
}

bool IsInEndpoint(std::uint8_t endpoint) {
    return (endpoint & 0x80) != 0;
}

void FillVendorRequest(Usb::Transfer& transfer, const std::uint8_t* block, std::span<std::uint8_t> data) {
    transfer.endpoint = 0;
    transfer.setup.requestType =
        block[Native::Block::Direction] == Native::DirectionIn ? Protocol::VendorIn : Protocol::VendorOut;
    transfer.setup.request = block[Native::Block::Request];
    transfer.setup.value = Protocol::LoadLittle16(block + Native::Block::Value);
    transfer.setup.index = Protocol::LoadLittle16(block + Native::Block::Index);
    transfer.setup.length = static_cast<std::uint16_t>(data.size());
    transfer.data = data.data();
    transfer.length = transfer.setup.length;
}

bool IsVendorRequest(const std::uint8_t* block) {
    return block[Native::Block::Direction] <= Native::DirectionIn &&
           block[Native::Block::Type] == Native::TypeVendor && block[Native::Block::Recipient] == 0;
}

}  // namespace

std::unique_ptr<NativeDriverFile> NativeDriverFile::Open(std::shared_ptr<SharedDevice> shared,
                                                         std::uint32_t pipeNumber,
                                                         EndpointCanceller& endpointCanceller,
                                                         ErrorCode& error) {
    error = shared->Claim();
    if (error != Errors::Success) {
        return nullptr;
    }
    SharedDevice& device = *shared;
    std::unique_ptr<NativeDriverFile> file;
    try {
        file.reset(new NativeDriverFile(std::move(shared), EndpointOfPipe(pipeNumber), endpointCanceller));
    } catch (...) {
        device.Unclaim();
        throw;
    }
    if (file->endpoint_ != 0) {
        bool found = false;
        error = device.FindEndpoint(file->endpoint_, found);
        if (error == Errors::Success && !found) {
            error = Errors::FileNotFound;
        }
    }
    return error == Errors::Success ? std::move(file) : nullptr;
}

NativeDriverFile::NativeDriverFile(std::shared_ptr<SharedDevice> shared, std::uint8_t pipeEndpoint,
                                   EndpointCanceller& endpointCanceller)
    : DriverFile(std::move(shared)), endpoint_(pipeEndpoint), canceller_(endpointCanceller) {}

NativeDriverFile::~NativeDriverFile() {
    Device().Unclaim();
}

Decision NativeDriverFile::Read(Usb::Transfer& transfer) {
    if (!IsInEndpoint(endpoint_)) {
        return Decision::Refuse(Errors::InvalidFunction);
    }
    transfer.endpoint = endpoint_;
    return transfer.length == 0 ? Decision::Done(0) : Decision::Send();
}

Decision NativeDriverFile::Write(Usb::Transfer& transfer) {
    if (endpoint_ == 0 || IsInEndpoint(endpoint_)) {
        return Decision::Refuse(Errors::InvalidFunction);
    }
    transfer.endpoint = endpoint_;
    return Decision::Send();
}

Decision NativeDriverFile::Control(std::uint32_t code, std::span<const std::uint8_t> input,
                                   std::span<std::uint8_t> output, Usb::Transfer& transfer) {
    if (endpoint_ != 0) {
        return Decision::Refuse(Errors::InvalidFunction);
    }
    const bool isKnown = code == Native::ControlVendorRequest || code == Native::ControlAbortPipe ||
                         code == Native::ControlButtonReport;
    if (!isKnown) {
        return Decision::Refuse(Errors::InvalidFunction);
    }
    if (input.size() != Native::ControlBlockSize) {
        return Decision::Refuse(Errors::InvalidParameter);
    }
    const std::uint8_t* const block = input.data();
    if (code == Native::ControlAbortPipe) {
        const std::uint16_t named = Protocol::LoadLittle16(block + Native::Block::Value);
        const auto address = static_cast<std::uint8_t>(named);
        bool found = false;
        const ErrorCode unknown = Device().FindEndpoint(address, found);
        if (unknown != Errors::Success) {
            return Decision::Refuse(unknown);
        }
        if (named != address || !found) {
            return Decision::Refuse(Errors::InvalidParameter);
        }
        canceller_.CancelEndpoint(Device(), address);
        return Decision::Done(0);
    }
    const std::span<std::uint8_t> data =
        code == Native::ControlVendorRequest ? output : std::span<std::uint8_t>();
    if (!IsVendorRequest(block) || data.size() > std::numeric_limits<std::uint16_t>::max()) {
        return Decision::Refuse(Errors::InvalidParameter);
    }
    FillVendorRequest(transfer, block, data);
    return Decision::Send();
}

ErrorCode NativeDriverFile::OutcomeOf(Usb::TransferStatus status) const {
    switch (status) {
        case Usb::TransferStatus::Completed:
            return Errors::Success;
        case Usb::TransferStatus::Cancelled:
            return Errors::OperationAborted;
        case Usb::TransferStatus::DeviceGone:
            return Errors::DeviceNotConnected;
        case Usb::TransferStatus::Stalled:
        case Usb::TransferStatus::IoError:
        case Usb::TransferStatus::Overflow:
            break;
    }
    return Errors::GeneralFailure;
}

ErrorCode NativeDriverFile::RefusalOf(ErrorCode usbCode) const {
    return usbCode;
}

}  // namespace Varnholt::Platform::Drivers
