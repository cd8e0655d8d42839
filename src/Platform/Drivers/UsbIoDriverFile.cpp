#include "Platform/Drivers/UsbIoDriverFile.h"

#include <algorithm>
#include <array>
#include <limits>
#include <utility>

#include "Platform/LookUp.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/Instrument.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Platform::Drivers {
namespace {

namespace UsbIo = Protocol::UsbIoDriver;
namespace Status = Protocol::UsbIoDriver::Status;

/// The bits of a request type that name neither direction nor type nor one of the four known recipients.
constexpr std::uint8_t ReservedTypeBits = 0x1C;

struct ControlShape {
    std::uint32_t code;
    std::size_t inputSize;   ///< at least
    std::size_t outputSize;  ///< at least
};

constexpr std::array<ControlShape, 9> ControlShapes{{
    {UsbIo::Control::SetConfiguration, UsbIo::ConfigurationBlock::Size, 0},
    {UsbIo::Control::UnconfigureDevice, 0, 0},
    {UsbIo::Control::ClassOrVendorInRequest, UsbIo::RequestBlock::Size, 0},
    {UsbIo::Control::ClassOrVendorOutRequest, UsbIo::RequestBlock::Size, 0},
    {UsbIo::Control::GetDeviceParameters, 0, UsbIo::DeviceParametersSize},
    {UsbIo::Control::SetDeviceParameters, UsbIo::DeviceParametersSize, 0},
    {UsbIo::Control::GetDriverInfo, 0, UsbIo::DriverInfoSize},
    {UsbIo::Control::BindPipe, 1, 0},
    {UsbIo::Control::AbortPipe, 0, 0},
}};

ErrorCode CheckShape(std::uint32_t code, std::size_t inputSize, std::size_t outputSize) {
    const auto shape = std::find_if(ControlShapes.begin(), ControlShapes.end(),
                                    [code](const ControlShape& candidate) { return candidate.code == code; });
    if (shape == ControlShapes.end()) {
        return Status::ControlNotSupported;
    }
    if (inputSize < shape->inputSize) {
        return Status::InputBufferTooSmall;
    }
    return outputSize < shape->outputSize ? Status::OutputBufferTooSmall : Status::Success;
}

Decision Answer(ErrorCode status) {
    return status == Status::Success ? Decision::Done(0) : Decision::Refuse(status);
}

Decision DriverInfo(std::span<std::uint8_t> output) {
    std::fill_n(output.begin(), UsbIo::DriverInfoSize, std::uint8_t{0});
    Protocol::StoreLittle16(output.data(), UsbIo::InterfaceVersion);
    return Decision::Done(UsbIo::DriverInfoSize);
}

}  // namespace

UsbIoDriverFile::UsbIoDriverFile(std::shared_ptr<UsbIoDevice> usbIoDevice)
    : DriverFile(usbIoDevice->Shared()), usbIo_(std::move(usbIoDevice)) {}

UsbIoDriverFile::~UsbIoDriverFile() {
    usbIo_->Unbind(binding_);
}

Decision UsbIoDriverFile::Move(bool in, Usb::Transfer& transfer) {
    transfer.endpoint = binding_.load(std::memory_order_relaxed);
    if (transfer.endpoint == 0) {
        return Decision::Refuse(Status::NotBound);
    }
    if (transfer.IsIn() != in) {
        return Decision::Refuse(Status::InvalidDirection);
    }
    if (transfer.length > usbIo_->MaximumTransfer()) {
        return Decision::Refuse(Status::InvalidParameter);
    }
    return in && transfer.length == 0 ? Decision::Done(0) : Decision::Send();
}

Decision UsbIoDriverFile::Control(std::uint32_t code, std::span<const std::uint8_t> input,
                                  std::span<std::uint8_t> output, Usb::Transfer& transfer) {
    const ErrorCode misshapen = CheckShape(code, input.size(), output.size());
    if (misshapen != Status::Success) {
        return Decision::Refuse(misshapen);
    }
    if (code == UsbIo::Control::GetDriverInfo) {
        return DriverInfo(output);
    }
    if (Device().IsGone()) {
        return Decision::Refuse(Status::DeviceRemoved);
    }
    switch (code) {
        case UsbIo::Control::SetConfiguration:
            return Answer(usbIo_->Configure(input));
        case UsbIo::Control::UnconfigureDevice:
            return Answer(usbIo_->Unconfigure());
        case UsbIo::Control::GetDeviceParameters:
            std::ranges::copy(usbIo_->ReadParameters(), output.begin());
            return Decision::Done(UsbIo::DeviceParametersSize);
        case UsbIo::Control::SetDeviceParameters: {
            UsbIoDevice::Parameters parameters{};
            std::copy_n(input.begin(), parameters.size(), parameters.begin());
            usbIo_->WriteParameters(parameters);
            return Decision::Done(0);
        }
        case UsbIo::Control::BindPipe:
            return Answer(usbIo_->Bind(input[0], binding_));
        case UsbIo::Control::AbortPipe: {
            const std::uint8_t endpoint = binding_.load();
            return endpoint == 0 ? Decision::Refuse(Status::NotBound) : Abort(endpoint);
        }
        default:
            return VendorRequest(code == UsbIo::Control::ClassOrVendorInRequest, input, output, transfer);
    }
}

Decision UsbIoDriverFile::VendorRequest(bool in, std::span<const std::uint8_t> block,
                                        std::span<std::uint8_t> data, Usb::Transfer& transfer) const {
    namespace Field = UsbIo::RequestBlock;
    if (Protocol::LoadLittle32(block.data() + Field::Type) != Field::TypeVendor) {
        return Decision::Refuse(Status::InvalidType);
    }
    if (Protocol::LoadLittle32(block.data() + Field::Recipient) != 0) {
        return Decision::Refuse(Status::InvalidRecipient);
    }
    const std::uint8_t reserved = block[Field::ReservedBits];
    if ((reserved & ~ReservedTypeBits) != 0 || data.size() > std::numeric_limits<std::uint16_t>::max()) {
        return Decision::Refuse(Status::InvalidParameter);
    }
    if (!Device().IsClaimed()) {
        return Decision::Refuse(Status::NotConfigured);
    }
    const int requestType = (in ? Protocol::VendorIn : Protocol::VendorOut) | reserved;
    transfer.MakeControl({.requestType = static_cast<std::uint8_t>(requestType),
                          .request = block[Field::Request],
                          .value = Protocol::LoadLittle16(block.data() + Field::Value),
                          .index = Protocol::LoadLittle16(block.data() + Field::Index)},
                         data);
    return Decision::Send();
}

ErrorCode UsbIoDriverFile::OutcomeOf(Usb::TransferStatus status) const {
    static constexpr std::pair<Usb::TransferStatus, ErrorCode> outcomes[] = {
        {Usb::TransferStatus::Completed, Status::Success},
        {Usb::TransferStatus::Stalled, Status::EndpointHalted},
        {Usb::TransferStatus::IoError, Status::TransactionError},
        {Usb::TransferStatus::Overflow, Status::BabbleDetected},
        {Usb::TransferStatus::Cancelled, Status::Cancelled},
        {Usb::TransferStatus::DeviceGone, Status::DeviceRemoved},
    };
    return LookUp(outcomes, status, Status::RequestFailed);
}

std::uint32_t UsbIoDriverFile::TimeLimitOf(const Usb::Transfer& transfer) const {
    // What an instrument takes to answer a request or to store data: the slowest memory needs 10 ms a byte.
    constexpr std::uint32_t answer = 5000;
    constexpr std::uint32_t storeByte = 10;
    if (transfer.endpoint == 0) {
        return answer;
    }
    return transfer.IsIn() ? 0 : transfer.length * storeByte + answer;
}

}  // namespace Varnholt::Platform::Drivers
