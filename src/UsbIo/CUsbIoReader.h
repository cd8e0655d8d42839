#pragma once

#include "UsbIo/CUsbIoThread.h"

namespace Varnholt::UsbIo {

/// Reads a pipe without a gap: every free buffer has a read running. `OnBufferCompleted` gets them in order.
class CUsbIoReader : public CUsbIoThread {
  protected:
    void ThreadRoutine() override;
    void StopTransfers() override;
};

}  // namespace Varnholt::UsbIo
