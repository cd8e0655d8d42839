#pragma once

#include <cstdint>
#include <vector>

namespace Varnholt::Service {

/// The content of an EEPROM, 8192 bytes.
using EepromImage = std::vector<std::uint8_t>;

}  // namespace Varnholt::Service
