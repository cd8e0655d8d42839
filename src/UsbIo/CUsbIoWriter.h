#pragma once

#include "UsbIo/CUsbIoThread.h"

namespace Varnholt::UsbIo {

/// Writes a pipe without a gap: `PrepareBuffer` fills each buffer and says how much of it is to be sent, or
/// sets `OperationFinished` when there is no more. `OnBufferCompleted` is not called.
class CUsbIoWriter : public CUsbIoThread {
  protected:
    void ThreadRoutine() override;
    void StopTransfers() override;
};

}  // namespace Varnholt::UsbIo
