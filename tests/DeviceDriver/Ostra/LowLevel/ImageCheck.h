#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// What became of an image of 8192 bytes.
enum class ImageOutcome {
    Refused,        ///< cannot be loaded, with a documented exception
    DumpRefused,    ///< was loaded and read; changing or dumping it is refused, with a documented exception
    Misplaced,      ///< was dumped, but its table has values elsewhere than a dump puts them
    RoundTripRight  ///< the dump was loaded again and holds the same values, in both copies of the log
};

/// Gives the value a new number of elements, so that the dump must make room.
struct Resize {
    std::uint16_t id;
    std::uint16_t elements;
};

/// Loads the image as an instrument's EEPROM, resizes values, reads every value, dumps it and loads the dump.
/// Anything that is not one of the outcomes throws `std::logic_error` with what went wrong.
ImageOutcome CheckImage(const std::vector<std::uint8_t>& image, const std::vector<Resize>& resizes = {});

/// The image and the resizes that a short text of bytes stands for: records of 4 bytes, two big-endian
/// numbers. A record whose first number is below 8192 puts its second into a fresh image at that address; any
/// other first number picks the value that is to have as many elements as the second says.
ImageOutcome CheckRecords(const std::uint8_t* records, std::size_t size);

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
