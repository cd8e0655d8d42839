#pragma once

#include <atomic>
#include <cstdint>
#include <memory>

#include "Platform/ErrorCodes.h"
#include "Platform/OverlappedRequest.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::UsbIo {

/// One transfer buffer with the transfer that runs on it. The buffer is not destroyed, and its memory not
/// given back, before its transfer has completed: the destructor cancels a transfer that still runs and waits
/// for its end. Only the thread that started a transfer can cancel it; another thread's destructor waits
/// until the transfer ends by itself or its pipe is aborted or closed.
class CUsbIoBuffer final {
  public:
    /// Without memory: `Buffer` and `Size` are the user's to set.
    CUsbIoBuffer();
    /// Over the caller's memory, which must outlive the object.
    CUsbIoBuffer(void* data, std::uint32_t size);
    /// With `size` bytes of its own; `Buffer` is null and `Size` 0 when there is no memory.
    explicit CUsbIoBuffer(std::uint32_t size);
    ~CUsbIoBuffer();
    CUsbIoBuffer(const CUsbIoBuffer&) = delete;
    CUsbIoBuffer& operator=(const CUsbIoBuffer&) = delete;

    std::uint32_t NumberOfBytesToTransfer = 0;    ///< bytes to read or write, at most `Size`
    std::uint32_t BytesTransferred = 0;           ///< bytes moved by the last transfer, also by a failed one
    std::uint32_t Status = 0;                     ///< of the last transfer; `Errors::IoPending` while it runs
    CUsbIoBuffer* Next = nullptr;                 ///< link in the free list or the pending list
    std::atomic<bool> OperationFinished = false;  ///< set by the user to end a streaming thread
    void* Buffer = nullptr;
    std::uint32_t Size = 0;  ///< capacity of `Buffer`, bytes

    bool IsPending() const { return Status == Platform::Errors::IoPending; }

  private:
    friend class CUsbIoPipe;

    /// `operation` moves `NumberOfBytesToTransfer` bytes of `Buffer`. True when the transfer has completed or
    /// runs; `Status` tells which, or why not.
    bool Start(Platform::Handle file, const Platform::Operation& operation);
    /// Fetches the result without waiting.
    void Collect();
    /// Cancels a transfer that still runs, waits for its end and fetches what it moved. By the thread that
    /// started it.
    void CancelAndCollect();
    /// Whatever a driver reports, nobody is sent behind the end of the buffer.
    void LimitCount();

    const Platform::OwnedHandle completionEvent_;
    Platform::OverlappedRequest request_;
    std::unique_ptr<std::uint8_t[]> allocatedMemory_;
};

}  // namespace Varnholt::UsbIo
