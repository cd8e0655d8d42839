#pragma once

#include <algorithm>
#include <cstdint>

#include "Platform/WaitableObjects.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// What a transfer of a scan gets beyond the scan's time-out.
constexpr std::uint32_t ScanGrace = 3000;  // milliseconds

/// A time-out in milliseconds, computed without wrapping and never `Platform::Infinite`: a caller's huge
/// time-out must not turn into a short wait or into one without end.
constexpr std::uint32_t WaitLimit(std::uint64_t milliseconds) {
    return static_cast<std::uint32_t>(std::min<std::uint64_t>(milliseconds, Platform::Infinite - 1));
}
constexpr std::uint32_t WaitLimit(std::uint32_t milliseconds, std::uint32_t more) {
    return WaitLimit(std::uint64_t{milliseconds} + more);
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
