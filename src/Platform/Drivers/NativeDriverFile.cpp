#include "Platform/Drivers/NativeDriverFile.h"

#include <array>
#include <limits>
#include <utility>

#include "Platform/LookUp.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/Instrument.h"
#include "Protocol/NativeDriver.h"

namespace Varnholt::Platform::Drivers {
namespace {

namespace Native = Protocol::NativeDriver;

/// By the number of the pipe: the device itself, read, write and interrupt pipe.
constexpr std::array<std::uint8_t, 4> Endpoints{0, Protocol::BulkInEndpoint, Protocol::BulkOutEndpoint,
                                                Protocol::InterruptInEndpoint};
static_assert(Native::ReadPipe == 1 && Native::WritePipe == 2 && Native::InterruptPipe == 3);

Usb::SetupPacket SetupOf(const std::uint8_t* block) {
    const bool in = block[Native::Block::Direction] == Native::DirectionIn;
    return {.requestType = in ? Protocol::VendorIn : Protocol::VendorOut,
            .request = block[Native::Block::Request],
            .value = Protocol::LoadLittle16(block + Native::Block::Value),
            .index = Protocol::LoadLittle16(block + Native::Block::Index)};
}

bool IsVendorRequest(const std::uint8_t* block) {
    return block[Native::Block::Direction] <= Native::DirectionIn &&
           block[Native::Block::Type] == Native::TypeVendor && block[Native::Block::Recipient] == 0;
}

}  // namespace

std::unique_ptr<NativeDriverFile> NativeDriverFile::Open(std::shared_ptr<SharedDevice> shared,
                                                         std::uint32_t pipeNumber, ErrorCode& error) {
    std::unique_ptr<NativeDriverFile> file(new NativeDriverFile(std::move(shared), Endpoints[pipeNumber]));
    error = file->Device().Claim();
    file->isClaimed_ = error == Errors::Success;
    if (file->isClaimed_ && file->endpoint_ != 0) {
        error = file->Device().FindEndpoint(file->endpoint_, Errors::FileNotFound);
    }
    return error == Errors::Success ? std::move(file) : nullptr;
}

NativeDriverFile::~NativeDriverFile() {
    if (isClaimed_) {
        Device().Unclaim();
    }
}

Decision NativeDriverFile::Move(bool in, Usb::Transfer& transfer) {
    transfer.endpoint = endpoint_;
    if (endpoint_ == 0 || transfer.IsIn() != in) {
        return Decision::Refuse(Errors::InvalidFunction);
    }
    return in && transfer.length == 0 ? Decision::Done(0) : Decision::Send();
}

Decision NativeDriverFile::Control(std::uint32_t code, std::span<const std::uint8_t> input,
                                   std::span<std::uint8_t> output, Usb::Transfer& transfer) {
    const bool isKnown = code == Native::ControlVendorRequest || code == Native::ControlAbortPipe ||
                         code == Native::ControlButtonReport;
    if (endpoint_ != 0 || !isKnown) {
        return Decision::Refuse(Errors::InvalidFunction);
    }
    if (input.size() != Native::ControlBlockSize) {
        return Decision::Refuse(Errors::InvalidParameter);
    }
    const std::uint8_t* const block = input.data();
    if (code == Native::ControlAbortPipe) {
        return AbortPipe(Protocol::LoadLittle16(block + Native::Block::Value));
    }
    const std::span<std::uint8_t> data =
        code == Native::ControlVendorRequest ? output : std::span<std::uint8_t>();
    if (!IsVendorRequest(block) || data.size() > std::numeric_limits<std::uint16_t>::max()) {
        return Decision::Refuse(Errors::InvalidParameter);
    }
    transfer.MakeControl(SetupOf(block), data);
    return Decision::Send();
}

Decision NativeDriverFile::AbortPipe(std::uint16_t endpoint) const {
    const auto address = static_cast<std::uint8_t>(endpoint);
    const ErrorCode code = endpoint == address ? Device().FindEndpoint(address, Errors::InvalidParameter)
                                               : Errors::InvalidParameter;
    return code == Errors::Success ? Abort(address) : Decision::Refuse(code);
}

ErrorCode NativeDriverFile::OutcomeOf(Usb::TransferStatus status) const {
    static constexpr std::pair<Usb::TransferStatus, ErrorCode> outcomes[] = {
        {Usb::TransferStatus::Completed, Errors::Success},
        {Usb::TransferStatus::Cancelled, Errors::OperationAborted},
        {Usb::TransferStatus::DeviceGone, Errors::DeviceNotConnected},
    };
    return LookUp(outcomes, status, Errors::GeneralFailure);
}

}  // namespace Varnholt::Platform::Drivers
