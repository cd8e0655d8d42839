#include "DeviceDriver/Ostra/LowLevel/Win64/ScanBuffer.h"

#include <algorithm>
#include <cstdlib>
#include <new>

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

void ScanBuffer::Freer::operator()(std::uint8_t* bytes) const noexcept {
    std::free(bytes);
}

void ScanBuffer::Reset(std::size_t newSize) {
    size = 0;
    if (capacity < newSize) {
        memory.reset();
        capacity = 0;
        memory.reset(static_cast<std::uint8_t*>(std::calloc(newSize, 1)));
        if (!memory) {
            throw std::bad_alloc();
        }
        capacity = newSize;
    }
    size = newSize;
}

void ScanBuffer::Reserve(std::uint64_t newCapacity) {
    if (newCapacity <= capacity) {
        return;
    }
    const auto bytes = static_cast<std::size_t>(newCapacity);
    void* const moved = bytes == newCapacity ? std::realloc(memory.get(), bytes) : nullptr;
    if (!moved) {
        throw std::bad_alloc();
    }
    static_cast<void>(memory.release());
    memory.reset(static_cast<std::uint8_t*>(moved));
    capacity = bytes;
}

void ScanBuffer::Resize(std::size_t newSize) {
    size = std::min(newSize, capacity);
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
