#pragma once

#include <optional>
#include <string>
#include <vector>

#include "Service/Memory/EepromImage.h"
#include "Service/Memory/PropertyText.h"

namespace Varnholt::Service {

/// How two images differ: first by what the values mean, then by where the bytes are.
struct ImageDiff {
    struct Value {
        std::string kind;  ///< "calibration", "log", "table" (an address), "word"
        std::uint16_t id;
        std::optional<Property> a, b;  ///< absent where the image has no such value
    };
    struct Area {
        std::string name;
        std::uint32_t first, last;  ///< addresses of the area
        std::uint32_t different;    ///< bytes
        std::uint32_t firstDifference;
    };

    std::vector<Value> values;
    std::vector<Area> areas;
    /// Why the values of an image cannot be read; with one of them there is nothing to compare.
    std::string unreadableA, unreadableB;

    bool IsEmpty() const { return areas.empty(); }
};

ImageDiff Compare(const EepromImage& a, const EepromImage& b);

}  // namespace Varnholt::Service
