#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace Varnholt::Simulator {

/// An EEPROM image from a file. Throws `std::runtime_error` with a text for people when it cannot be read or
/// has not exactly 8192 bytes.
std::vector<std::uint8_t> ReadEepromFile(const std::string& fileName);

}  // namespace Varnholt::Simulator
