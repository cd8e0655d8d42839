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

/// The 128 values of a raw readout: big-endian 16-bit numbers, those above 0xF800 negative. The first and the
/// last sensor element carry no reading of their own and repeat their neighbour.
std::array<std::int32_t, Protocol::ReadoutValues> ReadoutFromBytes(
    std::span<const std::uint8_t, Protocol::ReadoutBytes> bytes);

}  // namespace Varnholt::Interface
