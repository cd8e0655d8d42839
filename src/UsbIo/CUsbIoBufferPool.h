#pragma once

#include <atomic>
#include <cstdint>
#include <memory>

#include "Platform/WaitableObjects.h"
#include "UsbIo/CUsbIoBuffer.h"

namespace Varnholt::UsbIo {

/// Transfer buffers of one size over one block of memory. Any thread. Buffers taken out stay the pool's:
/// no transfer of theirs may run when it frees them.
class CUsbIoBufferPool final {
  public:
    CUsbIoBufferPool() = default;
    ~CUsbIoBufferPool();
    CUsbIoBufferPool(const CUsbIoBufferPool&) = delete;
    CUsbIoBufferPool& operator=(const CUsbIoBufferPool&) = delete;

    /// False, with nothing changed, when the pool has buffers already or there is no memory.
    bool Allocate(std::uint32_t sizeOfBuffer, std::uint32_t numberOfBuffers);
    void Free();

    /// The buffer put back last; null when none is free.
    CUsbIoBuffer* Get();
    void Put(CUsbIoBuffer* buffer);

    /// Free buffers.
    std::uint32_t CurrentCount() const { return currentCount_; }

  private:
    Platform::RecursiveMutex lock_;                ///< guards all below
    CUsbIoBuffer* Head = nullptr;                  ///< first free buffer
    std::atomic<std::uint32_t> currentCount_ = 0;  ///< also read without the lock
    std::unique_ptr<std::uint8_t[]> memory_;       ///< what the buffers' transfers write to: freed after them
    std::unique_ptr<CUsbIoBuffer[]> buffers_;
};

}  // namespace Varnholt::UsbIo
