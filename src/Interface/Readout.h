#pragma once

#include <array>
#include <cstdint>
#include <span>

#include "Protocol/Instrument.h"

namespace Varnholt::Interface {

/// How the interface takes a readout: what it waits after opening, the measurement parameters p1 to p4, and
/// the time-out of the measurement.
namespace FixedReadout {
inline constexpr std::uint32_t WaitAfterOpening = 1000;  ///< milliseconds
inline constexpr std::uint16_t P1 = 294;
inline constexpr std::uint16_t P2 = 0;
inline constexpr std::uint16_t P3 = 1;
inline constexpr std::uint8_t P4 = 6;
inline constexpr std::uint32_t Timeout = 1;  ///< seconds
}  // namespace FixedReadout

/// A reading as it travels, as a number: those above 0xF800 are negative.
constexpr std::int32_t ReadingOf(std::uint16_t travelling) {
    constexpr std::int32_t highestPositive = 0xF800;
    return travelling > highestPositive ? travelling - 0x10000 : travelling;
}

/// The 128 values of a raw readout: big-endian 16-bit numbers. The first and the
/// last sensor element carry no reading of their own and repeat their neighbour.
std::array<std::int32_t, Protocol::ReadoutValues> ReadoutFromBytes(
    std::span<const std::uint8_t, Protocol::ReadoutBytes> bytes);

}  // namespace Varnholt::Interface
