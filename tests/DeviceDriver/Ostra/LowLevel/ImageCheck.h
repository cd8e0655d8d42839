#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// What became of an image of 8192 bytes.
enum class ImageOutcome {
    Refused,        ///< cannot be loaded, with a documented exception
    DumpRefused,    ///< was loaded and read; dumping it is refused, with a documented exception
    RoundTripRight  ///< the dump was loaded again and holds the same values, in both copies of the log
};

/// Loads the image as an instrument's EEPROM, reads every value, dumps it and loads the dump. Anything that
/// is not one of the outcomes throws `std::logic_error` with what went wrong.
ImageOutcome CheckImage(const std::vector<std::uint8_t>& image);

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
