#pragma once

#include <cstdint>

#include "DeviceDriver/Generic/Configuration/Properties.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

class PellandoEAT;

/// Reads one section of an EEPROM image: the values that a predicate picks from the allocation table, in the
/// table's order.
class SectionReader final {
  public:
    using Predicate = bool (*)(std::uint16_t id);

    /// The table is not owned and must outlive the reader.
    SectionReader(const PellandoEAT& allocationTable, Predicate picks)
        : table_(allocationTable), isPicked_(picks) {}

    /// `image` points to byte 0 of an image of 8192 bytes. Each value is read at the address of its
    /// identifier plus `idOffset` and filed under its identifier. The table says how many bytes that is,
    /// which may be more or less than the identifier's default has; an empty value is possible.
    ///
    /// Of a size that is no multiple of 4 the bytes behind the last whole element are ignored. An address
    /// outside the image, a negative size, or a value that ends outside the image is refused with
    /// `DataException` "corrupt EAT detected!!"; an identifier that the table lacks or has as its last entry
    /// with `ResourceException` "id N doesn't exist".
    Generic::Configuration::Properties operator()(const std::uint8_t* image, std::uint16_t idOffset) const;

  private:
    const PellandoEAT& table_;
    const Predicate isPicked_;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
