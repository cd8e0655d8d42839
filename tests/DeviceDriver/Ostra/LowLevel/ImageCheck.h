#pragma once

#include <cstdint>
#include <vector>

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// Gives the value a new number of elements, so that the dump must make room.
struct Resize {
    std::uint16_t id;
    std::uint16_t elements;
};

/// Loads an image of 8192 bytes, resizes values, reads every value, dumps it and loads the dump. True when
/// that holds the same values, in both copies of the log; false when a step was refused with a documented
/// exception, or the image's table has values elsewhere than a dump puts them. Throws what else is thrown,
/// and `std::logic_error` where values differ.
bool RoundTrips(const std::vector<std::uint8_t>& image, const std::vector<Resize>& resizes = {});

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
