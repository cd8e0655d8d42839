#include "UsbIo/CUsbIoReader.h"

namespace Varnholt::UsbIo {

void CUsbIoReader::ThreadRoutine() {
    if (BufferPool.CurrentCount() == 0) {
        return;
    }
    errorCount = 0;
    while (!MustEnd()) {
        while (CUsbIoBuffer* const buffer = BufferPool.Get()) {
            PrepareBuffer(*buffer);
            if (buffer->OperationFinished || buffer->NumberOfBytesToTransfer == 0) {
                BufferPool.Put(buffer);
                break;
            }
            Read(*buffer);  // a read that does not start is pending as a failed one
            AppendPending(*buffer);
        }
        if (!HasPending()) {
            break;
        }
        CUsbIoBuffer& completed = TakeCompleted();
        OnBufferCompleted(completed);
        BufferPool.Put(&completed);
    }
    DrainPending();
}

void CUsbIoReader::StopTransfers() {
    AbortPipe();
}

}  // namespace Varnholt::UsbIo
