#include "UsbIo/CUsbIo.h"

#include <cstdio>
#include <mutex>
#include <new>
#include <span>
#include <string>
#include <utility>

#include "Platform/DeviceFiles.h"
#include "UsbIo/FailureCode.h"
#include "UsbIo/StatusTexts.h"

namespace Varnholt::UsbIo {

using namespace Protocol::UsbIoDriver;
using Platform::DeviceFiles;
using Platform::DeviceInterfaces;
using Platform::ErrorCode;

namespace {

constexpr std::uint16_t FirstInterfaceVersionBeyond = (InterfaceVersion & 0xFF00) + 0x0100;

}  // namespace

CUsbIo::~CUsbIo() {
    Close();
}

Platform::DeviceList CUsbIo::CreateDeviceList(const Protocol::Guid* interfaceGuid) try {
    if (!interfaceGuid || !DeviceInterfaces::Load()) {
        return nullptr;
    }
    return DeviceInterfaces::MakeList(*interfaceGuid, false);
} catch (const std::bad_alloc&) {
    Platform::SetLastError(Platform::Errors::NotEnoughMemory);
    return nullptr;
}

bool CUsbIo::DestroyDeviceList(Platform::DeviceList& list) {
    list.reset();
    return DeviceInterfaces::Load();
}

std::uint32_t CUsbIo::Open(int deviceNumber, const Platform::DeviceList& list,
                           const Protocol::Guid* interfaceGuid) try {
    if (IsOpen()) {
        return Status::AlreadyOpen;
    }
    std::string path;
    if (list) {
        if (const std::uint32_t status = ReadDetail(deviceNumber, list, interfaceGuid)) {
            return status;
        }
        path = GetDevicePathName();
    } else {
        path = "\\\\.\\USBIO_Device" + std::to_string(deviceNumber);
    }
    std::uint32_t status = OpenPath(path);
    if (status == Status::Success) {
        DriverInfo info;
        status = GetDriverInfo(info);
        if (status == Status::Success && (info.interfaceVersion < InterfaceVersion ||
                                          info.interfaceVersion >= FirstInterfaceVersionBeyond)) {
            status = Status::VersionMismatch;
        }
    }
    if (status != Status::Success) {
        Close();
    }
    return status;
} catch (const std::bad_alloc&) {
    Close();
    return Status::NoMemory;
}

std::uint32_t CUsbIo::OpenPath(const std::string& path) {
    const Platform::Handle file = DeviceFiles().Open(path);
    if (file == Platform::InvalidHandle()) {
        const ErrorCode code = FailureCode();
        return code == Platform::Errors::FileNotFound ? Status::DeviceNotFound : code;
    }
    FileHandle = file;
    controlEvent_ = Platform::OwnedHandle(Platform::MakeAutoResetEvent());
    if (!controlEvent_) {
        return Status::NoMemory;
    }
    controlRequest_.emplace(controlEvent_.Get());
    return Status::Success;
}

std::uint32_t CUsbIo::ReadDetail(int deviceNumber, const Platform::DeviceList& list,
                                 const Protocol::Guid* interfaceGuid) {
    if (!list || !interfaceGuid) {
        return Status::InvalidFunctionParameter;
    }
    if (!DeviceInterfaces::Load()) {
        return Status::NoEnumeration;
    }
    std::string path;
    switch (const ErrorCode code = DeviceInterfaces::ReadPath(
                list, *interfaceGuid, static_cast<std::uint32_t>(deviceNumber), path)) {
        case Platform::Errors::Success:
            DetailData = std::move(path);
            return Status::Success;
        case Platform::Errors::NoMoreItems:
            return Status::NoSuchDeviceInstance;
        case Platform::Errors::NoInterfaceDetail:
            return Status::Failed;
        default:
            return code;
    }
}

void CUsbIo::Close() {
    const Platform::Handle file = FileHandle.exchange(Platform::NoHandle);
    if (file != Platform::NoHandle) {
        DeviceFiles().CloseFile(file);
    }
    controlRequest_.reset();
    controlEvent_.Reset();
    DetailData.reset();
}

const char* CUsbIo::GetDevicePathName() const {
    return DetailData ? DetailData->c_str() : nullptr;
}

std::uint32_t CUsbIo::IoctlSync(std::uint32_t code, const void* input, std::uint32_t inputSize, void* output,
                                std::uint32_t outputSize, std::uint32_t* bytesReturned) {
    if (!IsOpen()) {
        return Status::DeviceNotOpen;
    }
    std::uint32_t transferred = 0;
    std::uint32_t status = Status::Success;
    {
        const std::lock_guard hold(controlLock_);
        const std::span block(static_cast<const std::uint8_t*>(input), inputSize);
        if (!controlRequest_->Start(FileHandle,
                                    Platform::Operation::Control(code, block, output, outputSize))) {
            status = FailureCode();
        }
        if (status == Platform::Errors::IoPending) {
            status = Status::Success;
        }
        if (status == Status::Success && !controlRequest_->GetResult(transferred, true)) {
            status = FailureCode();
        }
        if (controlRequest_->IsRunning()) {  // the wait was refused; the caller's buffers must be free again
            transferred = controlRequest_->CancelAndWait();
        }
    }
    if (bytesReturned) {
        *bytesReturned = transferred;
    }
    return status;
}

bool CUsbIo::CancelIo() {
    return DeviceFiles().CancelTransfers(FileHandle);
}

std::uint32_t CUsbIo::GetDriverInfo(DriverInfo& info) {
    DriverInfo::Bytes bytes{};
    const std::uint32_t status =
        IoctlSync(Control::GetDriverInfo, nullptr, 0, bytes.data(), bytes.size(), nullptr);
    info = DriverInfo::Decode(bytes);
    return status;
}

std::uint32_t CUsbIo::UnconfigureDevice() {
    return IoctlSync(Control::UnconfigureDevice, nullptr, 0, nullptr, 0, nullptr);
}

std::uint32_t CUsbIo::SetConfiguration(const Configuration& configuration) {
    if (configuration.interfaces.size() > ConfigurationBlock::MaximumEntries) {
        return Status::InvalidFunctionParameter;
    }
    const Configuration::Bytes bytes = configuration.Encode();
    return IoctlSync(Control::SetConfiguration, bytes.data(), bytes.size(), nullptr, 0, nullptr);
}

std::uint32_t CUsbIo::GetDeviceParameters(DeviceParameters& parameters) {
    DeviceParameters::Bytes bytes{};
    const std::uint32_t status =
        IoctlSync(Control::GetDeviceParameters, nullptr, 0, bytes.data(), bytes.size(), nullptr);
    parameters = DeviceParameters::Decode(bytes);
    return status;
}

std::uint32_t CUsbIo::SetDeviceParameters(const DeviceParameters& parameters) {
    const DeviceParameters::Bytes bytes = parameters.Encode();
    return IoctlSync(Control::SetDeviceParameters, bytes.data(), bytes.size(), nullptr, 0, nullptr);
}

std::uint32_t CUsbIo::ClassOrVendorInRequest(void* buffer, std::uint32_t& length,
                                             const ClassOrVendorRequest& request) {
    const ClassOrVendorRequest::Bytes block = request.Encode();
    return IoctlSync(Control::ClassOrVendorInRequest, block.data(), block.size(), buffer, length, &length);
}

std::uint32_t CUsbIo::ClassOrVendorOutRequest(const void* buffer, std::uint32_t& length,
                                              const ClassOrVendorRequest& request) {
    const ClassOrVendorRequest::Bytes block = request.Encode();
    // The data to send stand in the control's output buffer, which the driver only reads here.
    return IoctlSync(Control::ClassOrVendorOutRequest, block.data(), block.size(), const_cast<void*>(buffer),
                     length, &length);
}

char* CUsbIo::ErrorText(char* buffer, std::size_t size, std::uint32_t status) {
    if (buffer && size > 0) {
        static_cast<void>(std::snprintf(buffer, size, "Error code 0x%08X: %s",
                                        static_cast<unsigned int>(status), StatusText(status)));
        buffer[size - 1] = '\0';
    }
    return buffer;
}

}  // namespace Varnholt::UsbIo
