#include "UsbIo/CUsbIoBufferPool.h"

#include <cstddef>
#include <limits>
#include <mutex>
#include <new>
#include <utility>

namespace Varnholt::UsbIo {

CUsbIoBufferPool::~CUsbIoBufferPool() {
    Free();
}

bool CUsbIoBufferPool::Allocate(std::uint32_t sizeOfBuffer, std::uint32_t numberOfBuffers) try {
    const std::lock_guard hold(lock_);
    const std::uint64_t total = std::uint64_t{sizeOfBuffer} * numberOfBuffers;
    if (buffers_ || total > std::numeric_limits<std::ptrdiff_t>::max()) {
        return false;
    }
    auto newMemory = std::make_unique<std::uint8_t[]>(static_cast<std::size_t>(total));
    buffers_ = std::make_unique<CUsbIoBuffer[]>(numberOfBuffers);
    memory_ = std::move(newMemory);
    for (std::uint32_t i = 0; i < numberOfBuffers; ++i) {
        buffers_[i].Buffer = memory_.get() + std::size_t{i} * sizeOfBuffer;
        buffers_[i].Size = sizeOfBuffer;
        buffers_[i].Next = Head;
        Head = &buffers_[i];
    }
    currentCount_ = numberOfBuffers;
    return true;
} catch (const std::bad_alloc&) {
    return false;
}

void CUsbIoBufferPool::Free() {
    const std::lock_guard hold(lock_);
    buffers_.reset();
    memory_.reset();
    Head = nullptr;
    currentCount_ = 0;
}

CUsbIoBuffer* CUsbIoBufferPool::Get() {
    const std::lock_guard hold(lock_);
    if (!Head) {
        return nullptr;
    }
    --currentCount_;
    CUsbIoBuffer* const buffer = Head;
    Head = std::exchange(buffer->Next, nullptr);
    return buffer;
}

void CUsbIoBufferPool::Put(CUsbIoBuffer* buffer) {
    const std::lock_guard hold(lock_);
    buffer->Next = Head;
    Head = buffer;
    ++currentCount_;
}

}  // namespace Varnholt::UsbIo
