#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "Protocol/Instrument.h"

namespace Varnholt::Protocol {

struct EndpointName {
    std::uint8_t endpoint;
    std::string_view name;   ///< in fault plans and recorded transfers
    std::string_view words;  ///< in what is told to people
};
inline constexpr std::array EndpointNames{
    EndpointName{0, "control", "control"},
    EndpointName{BulkInEndpoint, "bulk-in", "bulk in"},
    EndpointName{BulkOutEndpoint, "bulk-out", "bulk out"},
    EndpointName{InterruptInEndpoint, "interrupt", "interrupt"},
};

/// The place in `EndpointNames`; one that the instrument does not have is taken for that of its direction.
constexpr std::size_t PlaceOfEndpoint(std::uint8_t endpoint) {
    const auto* const found = std::ranges::find(EndpointNames, endpoint, &EndpointName::endpoint);
    const std::size_t ofDirection = (endpoint & 0x80) != 0 ? 1 : 2;
    return found != EndpointNames.end() ? static_cast<std::size_t>(found - EndpointNames.begin())
                                        : ofDirection;
}

}  // namespace Varnholt::Protocol
