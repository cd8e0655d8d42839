#pragma once

#include <cstdint>
#include <vector>

namespace Varnholt::Simulator {

/// The EEPROM of an instrument that was never used: both logs empty with a valid checksum, the allocation
/// table of 55 entries, calibration values all -1, every other byte 0xFF. Written down here on its own: the
/// driver's memory model is tested against it.
std::vector<std::uint8_t> FreshEeprom();

}  // namespace Varnholt::Simulator
