#include "DeviceDriver/Ostra/LowLevel/Win64/ScanBuffer.h"

#include <algorithm>
#include <cstdlib>
#include <new>

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

void ScanBuffer::Freer::operator()(std::uint8_t* bytes) const noexcept {
    std::free(bytes);
}

void ScanBuffer::Reset(std::size_t newSize) {
    if (capacity_ < newSize) {
        *this = {};
        memory_.reset(static_cast<std::uint8_t*>(std::calloc(newSize, 1)));
        if (!memory_) {
            throw std::bad_alloc();
        }
        capacity_ = newSize;
    }
    size_ = newSize;
}

void ScanBuffer::Reserve(std::uint64_t newCapacity) {
    if (newCapacity <= capacity_) {
        return;
    }
    const auto bytes = static_cast<std::size_t>(newCapacity);
    void* const moved = bytes == newCapacity ? std::realloc(memory_.get(), bytes) : nullptr;
    if (!moved) {
        throw std::bad_alloc();
    }
    static_cast<void>(memory_.release());
    memory_.reset(static_cast<std::uint8_t*>(moved));
    capacity_ = bytes;
}

void ScanBuffer::Resize(std::size_t newSize) {
    size_ = std::min(newSize, capacity_);
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
