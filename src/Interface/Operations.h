#pragma once

#include <cstdint>
#include <span>
#include <string>

#include "Protocol/Instrument.h"

namespace Varnholt::Interface {

/// Writes a whole image into the named instrument's EEPROM, in increasing order of address. Nothing is
/// validated and nothing is read back; after a failure the EEPROM holds the pieces written before it.
void WriteImage(std::span<const std::uint8_t, Protocol::EepromSize> image, const std::string& deviceName);

/// Takes one readout of the named instrument with the fixed measurement parameters of the interface: 128
/// values in sensor order, -2047 to 63488. `values` is untouched after a failure.
void TakeReadout(std::span<std::int32_t, Protocol::ReadoutValues> values, const std::string& deviceName);

}  // namespace Varnholt::Interface
