#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <list>
#include <memory>
#include <span>

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// One record of a scan: a block of exactly the record size.
class ScanRecord final {
  public:
    explicit ScanRecord(std::span<const std::uint8_t> content)
        : bytes_(std::make_unique_for_overwrite<std::uint8_t[]>(content.size())), size_(content.size()) {
        std::memcpy(bytes_.get(), content.data(), size_);
    }

    std::span<const std::uint8_t> Bytes() const { return {bytes_.get(), size_}; }

  private:
    std::unique_ptr<std::uint8_t[]> bytes_;
    std::size_t size_;
};

/// In the order in which the instrument sent them; taken from the front.
using ScanRecordList = std::list<ScanRecord>;

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
