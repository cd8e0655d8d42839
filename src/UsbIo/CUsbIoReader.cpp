#include "UsbIo/CUsbIoReader.h"

#include <utility>

namespace Varnholt::UsbIo {

void CUsbIoReader::ThreadRoutine() {
    if (BufferPool.CurrentCount() == 0) {
        return;
    }
    errorCount_ = 0;
    while (!MustEnd()) {
        while (HeldBuffer buffer = TakeFree()) {
            PrepareBuffer(*buffer);
            if (buffer->OperationFinished || buffer->NumberOfBytesToTransfer == 0) {
                break;
            }
            Read(*buffer);  // a read that does not start is pending as a failed one
            AppendPending(std::move(buffer));
        }
        if (!HasPending()) {
            break;
        }
        const HeldBuffer completed = TakeCompleted();
        OnBufferCompleted(*completed);
    }
    DrainPending();
}

void CUsbIoReader::StopTransfers() {
    AbortPipe();
}

}  // namespace Varnholt::UsbIo
