#include "UsbIo/CUsbIoBuffer.h"

#include <algorithm>
#include <new>

#include "UsbIo/FailureCode.h"

namespace Varnholt::UsbIo {

using namespace Platform;

CUsbIoBuffer::CUsbIoBuffer() : completionEvent_(MakeAutoResetEvent()), request_(completionEvent_.Get()) {}

CUsbIoBuffer::CUsbIoBuffer(void* data, std::uint32_t size) : CUsbIoBuffer() {
    Buffer = data;
    Size = size;
}

CUsbIoBuffer::CUsbIoBuffer(std::uint32_t size) : CUsbIoBuffer() {
    allocatedMemory_.reset(new (std::nothrow) std::uint8_t[size]);
    Buffer = allocatedMemory_.get();
    Size = Buffer ? size : 0;
}

CUsbIoBuffer::~CUsbIoBuffer() {
    CancelAndCollect();
}

bool CUsbIoBuffer::Start(Handle file, const Operation& operation) {
    CancelAndCollect();
    BytesTransferred = 0;
    if (!completionEvent_ || NumberOfBytesToTransfer > Size) {
        Status = completionEvent_ ? Errors::InvalidParameter : Errors::NoSystemResources;
        return false;
    }
    if (request_.Start(file, operation)) {
        Collect();
        return Status == Errors::Success || IsPending();
    }
    Status = FailureCode();
    return IsPending();
}

void CUsbIoBuffer::Collect() {
    Status = request_.GetResult(BytesTransferred) ? Errors::Success : FailureCode();
    if (Status == Errors::IoIncomplete) {
        Status = Errors::IoPending;
    }
    LimitCount();
}

void CUsbIoBuffer::CancelAndCollect() {
    if (request_.IsRunning()) {
        BytesTransferred = request_.CancelAndWait();
        Status = Errors::OperationAborted;
        LimitCount();
    }
}

void CUsbIoBuffer::LimitCount() {
    BytesTransferred = std::min(BytesTransferred, Size);
}

}  // namespace Varnholt::UsbIo
