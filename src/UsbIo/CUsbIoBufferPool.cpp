#include "UsbIo/CUsbIoBufferPool.h"

#include <cstddef>
#include <limits>
#include <new>
#include <utility>

namespace Varnholt::UsbIo {

using Holder = Platform::CriticalSection::Holder;

CUsbIoBufferPool::~CUsbIoBufferPool() {
    Free();
}

bool CUsbIoBufferPool::Allocate(std::uint32_t sizeOfBuffer, std::uint32_t numberOfBuffers) try {
    Holder hold(lock);
    const std::uint64_t total = std::uint64_t{sizeOfBuffer} * numberOfBuffers;
    if (buffers || total > std::numeric_limits<std::ptrdiff_t>::max()) {
        return false;
    }
    auto newMemory = std::make_unique<std::uint8_t[]>(static_cast<std::size_t>(total));
    buffers = std::make_unique<CUsbIoBuffer[]>(numberOfBuffers);
    memory = std::move(newMemory);
    for (std::uint32_t i = 0; i < numberOfBuffers; ++i) {
        buffers[i].Buffer = memory.get() + std::size_t{i} * sizeOfBuffer;
        buffers[i].Size = sizeOfBuffer;
        buffers[i].Next = Head;
        Head = &buffers[i];
    }
    currentCount = numberOfBuffers;
    return true;
} catch (const std::bad_alloc&) {
    return false;
}

void CUsbIoBufferPool::Free() {
    Holder hold(lock);
    buffers.reset();
    memory.reset();
    Head = nullptr;
    currentCount = 0;
}

CUsbIoBuffer* CUsbIoBufferPool::Get() {
    Holder hold(lock);
    if (!Head) {
        return nullptr;
    }
    --currentCount;
    CUsbIoBuffer* const buffer = Head;
    Head = std::exchange(buffer->Next, nullptr);
    return buffer;
}

void CUsbIoBufferPool::Put(CUsbIoBuffer* buffer) {
    Holder hold(lock);
    buffer->Next = Head;
    Head = buffer;
    ++currentCount;
}

}  // namespace Varnholt::UsbIo
