#include "UsbIo/CUsbIoPipe.h"

#include <array>
#include <span>

namespace Varnholt::UsbIo {

using namespace Protocol::UsbIoDriver;
using Platform::Operation;
using Platform::WaitResult;

std::uint32_t CUsbIoPipe::Bind(int deviceNumber, unsigned char endpointAddress,
                               const Platform::DeviceList& list, const Protocol::Guid* interfaceGuid) {
    if (!IsOpen()) {
        if (const std::uint32_t status = Open(deviceNumber, list, interfaceGuid)) {
            return status;
        }
    }
    return IoctlSync(Control::BindPipe, &endpointAddress, sizeof(endpointAddress), nullptr, 0, nullptr);
}

std::uint32_t CUsbIoPipe::AbortPipe() {
    return IoctlSync(Control::AbortPipe, nullptr, 0, nullptr, 0, nullptr);
}

bool CUsbIoPipe::Read(CUsbIoBuffer& buffer) {
    return buffer.Start(FileHandle, Operation::Read(buffer.Buffer, buffer.NumberOfBytesToTransfer));
}

bool CUsbIoPipe::Write(CUsbIoBuffer& buffer) {
    return buffer.Start(FileHandle, Operation::Write(buffer.Buffer, buffer.NumberOfBytesToTransfer));
}

std::uint32_t CUsbIoPipe::WaitForCompletion(CUsbIoBuffer& buffer, std::uint32_t timeout,
                                            Platform::Handle event) {
    if (!buffer.IsPending()) {
        return buffer.Status;
    }
    const std::array objects{buffer.completionEvent_.Get(), event};
    const auto waited = Platform::WaitAny(
        std::span(objects).first(event == Platform::NoHandle ? 1 : objects.size()), timeout);
    switch (waited.result) {
        case WaitResult::Signalled:
            if (waited.index > 0) {
                return Status::UserEvent;
            }
            buffer.Collect();
            return buffer.Status;
        case WaitResult::TimedOut:
            return Status::TimedOut;
        case WaitResult::Abandoned:
            return static_cast<std::uint32_t>(waited.result) + static_cast<std::uint32_t>(waited.index);
        case WaitResult::Failed:
            break;
    }
    return static_cast<std::uint32_t>(waited.result);
}

std::uint32_t CUsbIoPipe::ReadSync(void* data, std::uint32_t& size, std::uint32_t timeout) {
    return ReadSyncUntil(data, size, timeout, Platform::NoHandle);
}

std::uint32_t CUsbIoPipe::ReadSyncUntil(void* data, std::uint32_t& size, std::uint32_t timeout,
                                        Platform::Handle event) {
    CUsbIoBuffer buffer(data, size);
    buffer.NumberOfBytesToTransfer = size;
    Read(buffer);
    return Finish(buffer, size, timeout, event);
}

std::uint32_t CUsbIoPipe::WriteSync(const void* data, std::uint32_t& size, std::uint32_t timeout) {
    CUsbIoBuffer buffer(const_cast<void*>(data), size);  // a write only reads it
    buffer.NumberOfBytesToTransfer = size;
    Write(buffer);
    return Finish(buffer, size, timeout, Platform::NoHandle);
}

void CUsbIoPipe::CancelToCompletion(CUsbIoBuffer& buffer) {
    buffer.CancelAndCollect();
}

std::uint32_t CUsbIoPipe::Finish(CUsbIoBuffer& buffer, std::uint32_t& size, std::uint32_t timeout,
                                 Platform::Handle event) {
    const std::uint32_t status = WaitForCompletion(buffer, timeout, event);
    CancelToCompletion(buffer);
    size = buffer.BytesTransferred;
    return status;
}

}  // namespace Varnholt::UsbIo
