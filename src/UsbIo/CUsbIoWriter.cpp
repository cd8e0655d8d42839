#include "UsbIo/CUsbIoWriter.h"

namespace Varnholt::UsbIo {

void CUsbIoWriter::ThreadRoutine() {
    if (BufferPool.CurrentCount() == 0) {
        return;
    }
    errorCount = 0;
    bool finished = false;
    while (!finished && !MustEnd()) {
        while (CUsbIoBuffer* const buffer = BufferPool.Get()) {
            PrepareBuffer(*buffer);
            if (buffer->OperationFinished) {
                BufferPool.Put(buffer);
                finished = true;
                break;
            }
            Write(*buffer);  // a write that does not start is pending as a failed one
            AppendPending(*buffer);
        }
        if (finished || !HasPending()) {
            break;
        }
        BufferPool.Put(&TakeCompleted());
    }
    DrainPending();
}

void CUsbIoWriter::StopTransfers() {
    AbortPipe();
}

}  // namespace Varnholt::UsbIo
