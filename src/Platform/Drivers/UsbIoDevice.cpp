#include "Platform/Drivers/UsbIoDevice.h"

#include <algorithm>
#include <mutex>
#include <utility>

#include "Platform/LookUp.h"
#include "Protocol/ByteOrder.h"

namespace Varnholt::Platform::Drivers {

namespace Block = Protocol::UsbIoDriver::ConfigurationBlock;
namespace Status = Protocol::UsbIoDriver::Status;

ErrorCode UsbIoRefusalOf(ErrorCode usbCode) {
    static constexpr std::pair<ErrorCode, ErrorCode> refusals[] = {
        {Errors::Success, Status::Success},
        {Errors::AccessDenied, Errors::AccessDenied},
        {Errors::Busy, Status::OpenedByOtherProcess},
        {Errors::FileNotFound, Status::DeviceRemoved},
        {Errors::DeviceNotConnected, Status::DeviceRemoved},
        {Errors::SemaphoreTimeout, Status::TimedOut},
        {Errors::NotEnoughMemory, Status::NoMemory},
    };
    return LookUp(refusals, usbCode, Status::RequestFailed);
}

UsbIoDevice::UsbIoDevice(std::shared_ptr<SharedDevice> shared) : device_(std::move(shared)) {}

UsbIoDevice::~UsbIoDevice() {
    if (configured_) {
        device_->Unclaim();
    }
}

ErrorCode UsbIoDevice::Configure(std::span<const std::uint8_t> block) {
    const std::lock_guard holder(lock_);
    if (configured_) {
        return Status::AlreadyConfigured;
    }
    const std::uint8_t* const entry = block.data() + Block::FirstEntry;
    const std::uint32_t maximum = Protocol::LoadLittle32(entry + Block::EntryMaximumTransferSize);
    if (Protocol::LoadLittle16(block.data() + Block::ConfigurationIndex) != 0 ||
        Protocol::LoadLittle16(block.data() + Block::InterfaceCount) != 1 || maximum == 0) {
        return Status::InvalidParameter;
    }
    if (Protocol::LoadLittle16(entry + Block::EntryInterface) != 0 ||
        Protocol::LoadLittle16(entry + Block::EntryAlternateSetting) != 0) {
        return Status::InterfaceNotFound;
    }
    const ErrorCode refused = device_->Claim();
    if (refused != Errors::Success) {
        return UsbIoRefusalOf(refused);
    }
    configured_ = true;
    maximumTransfer_.store(maximum, std::memory_order_relaxed);
    return Status::Success;
}

ErrorCode UsbIoDevice::Unconfigure() {
    const std::lock_guard holder(lock_);
    if (!bound_.empty()) {
        return Status::OpenPipes;
    }
    if (configured_) {
        configured_ = false;
        device_->Unclaim();
    }
    return Status::Success;
}

ErrorCode UsbIoDevice::Bind(std::uint8_t endpoint, Binding& binding) {
    const std::lock_guard holder(lock_);
    if (!configured_) {
        return Status::NotConfigured;
    }
    if (binding != 0) {
        return Status::AlreadyBound;
    }
    const ErrorCode code = device_->FindEndpoint(endpoint, Status::PipeNotFound);
    if (code != Errors::Success) {
        return code == Status::PipeNotFound ? code : UsbIoRefusalOf(code);
    }
    if (std::ranges::find(bound_, endpoint) != bound_.end()) {
        return Status::AlreadyBound;
    }
    bound_.push_back(endpoint);
    binding = endpoint;
    return Status::Success;
}

void UsbIoDevice::Unbind(std::uint8_t endpoint) {
    const std::lock_guard holder(lock_);
    std::erase(bound_, endpoint);
}

UsbIoDevice::Parameters UsbIoDevice::ReadParameters() {
    const std::lock_guard holder(lock_);
    return parameters_;
}

void UsbIoDevice::WriteParameters(const Parameters& source) {
    const std::lock_guard holder(lock_);
    parameters_ = source;
}

}  // namespace Varnholt::Platform::Drivers
