#pragma once

#include <cstdint>
#include <list>
#include <vector>

#include "DeviceDriver/Generic/Configuration/Properties.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

class PellandoEAT;

/// The usage log: twelve items with a checksum, kept twice in the EEPROM. The object is the log in memory;
/// who owns it writes it back when it recommends that. One thread at a time.
class PellandoLog final {
  public:
    using Property = Generic::Configuration::Property;
    using Properties = Generic::Configuration::Properties;

    /// Reads the log from an image of 8192 bytes: the main copy, the second one when the main copy's checksum
    /// is wrong, zeros when both are wrong. Fails as `SectionReader` does, and when the table has no checksum
    /// item.
    PellandoLog(const PellandoEAT& table, std::vector<std::uint8_t>::const_iterator image);
    PellandoLog(const PellandoLog&) = delete;
    PellandoLog& operator=(const PellandoLog&) = delete;

    /// Replaces the items by those of one copy in the image: `idOffset` 0 the main one, 1000 the second.
    void ParseBuffer(const PellandoEAT& table, const std::uint8_t* image, std::uint16_t idOffset);
    /// The second copy, or zeros when its checksum is wrong as well. Writes nothing.
    void RestoreLogData(const PellandoEAT& table, const std::uint8_t* image);

    /// The sum, modulo 2^32, of every 32-bit element of every item but the checksum; floats by their bit
    /// pattern.
    std::uint32_t CalculateChecksum() const;
    /// Both fail with `ResourceException` where there is no checksum item; an item that is empty is not
    /// valid.
    bool HasValidChecksum() const;
    void UpdateChecksum();

    /// An unknown identifier is refused with `ResourceException` "id N doesn't exist".
    const Property& GetItem(std::uint16_t id) const;
    /// Replaces the item in its place, or appends it. The checksum is left to `Dump`.
    void SetItem(std::uint16_t id, const Property& value);
    /// The integer wraps.
    void Increment(std::uint16_t id, std::int32_t step);
    void Increment(std::uint16_t id, float step);
    const Properties& GetItems() const { return items_; }

    /// After 20 changes, or when each of the items 10010 to 10013, 10020 and 10021 has been set since that
    /// last happened; until the next `Dump`.
    bool IsDumpRecommended() const;
    /// Bytes that `Dump` writes: 1064 for the standard items.
    std::size_t SizeOf() const;
    /// Brings the checksum up to date, begins a new count of changes, and writes the items' values one behind
    /// the other from `first` on. A range that is too short is refused with `ResourceException`, count and
    /// checksum already renewed.
    void Dump(std::vector<std::uint8_t>::iterator first, std::vector<std::uint8_t>::iterator last);

  private:
    void RefillPendingItems();

    Properties items_;
    std::int32_t changeCount_ = 0;
    std::list<std::uint16_t> pendingItems_;  ///< watched items not set since the list was last refilled
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
