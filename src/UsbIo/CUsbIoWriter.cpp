#include "UsbIo/CUsbIoWriter.h"

#include <utility>

namespace Varnholt::UsbIo {

void CUsbIoWriter::ThreadRoutine() {
    if (BufferPool.CurrentCount() == 0) {
        return;
    }
    errorCount_ = 0;
    bool finished = false;
    while (!finished && !MustEnd()) {
        while (HeldBuffer buffer = TakeFree()) {
            PrepareBuffer(*buffer);
            if (buffer->OperationFinished) {
                finished = true;
                break;
            }
            Write(*buffer);  // a write that does not start is pending as a failed one
            AppendPending(std::move(buffer));
        }
        if (finished || !HasPending()) {
            break;
        }
        TakeCompleted();
    }
    DrainPending();
}

void CUsbIoWriter::StopTransfers() {
    AbortPipe();
}

}  // namespace Varnholt::UsbIo
