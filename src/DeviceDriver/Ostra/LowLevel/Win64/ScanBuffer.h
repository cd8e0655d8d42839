#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// The bytes of a scan: up to gigabytes, so they are neither cleared by hand nor, where the system can move
/// pages, copied when they grow.
class ScanBuffer final {
  public:
    /// `size` bytes, of any content where the memory is there already, else zeros. Memory that is too small
    /// is given back before the new one is taken. `std::bad_alloc` leaves the buffer empty.
    void Reset(std::size_t size);
    /// Room for `newCapacity` bytes; the content stays. `std::bad_alloc` changes nothing.
    void Reserve(std::uint64_t newCapacity);
    /// At most the capacity. Bytes that are added are of any content.
    void Resize(std::size_t newSize);

    std::uint8_t* Data() const { return memory_.get(); }
    std::size_t Size() const { return size_; }
    std::size_t Capacity() const { return capacity_; }

  private:
    struct Freer {
        void operator()(std::uint8_t* bytes) const noexcept;
    };

    std::unique_ptr<std::uint8_t, Freer> memory_;
    std::size_t size_ = 0;
    std::size_t capacity_ = 0;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
