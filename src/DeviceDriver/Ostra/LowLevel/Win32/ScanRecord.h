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
        : bytes(std::make_unique_for_overwrite<std::uint8_t[]>(content.size())), size(content.size()) {
        std::memcpy(bytes.get(), content.data(), size);
    }

    std::span<const std::uint8_t> Bytes() const { return {bytes.get(), size}; }

  private:
    std::unique_ptr<std::uint8_t[]> bytes;
    std::size_t size;
};

/// In the order in which the instrument sent them; taken from the front.
using ScanRecordList = std::list<ScanRecord>;

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
