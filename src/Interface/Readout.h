#pragma once

#include <array>
#include <cstdint>
#include <span>

#include "Protocol/Instrument.h"

namespace Varnholt::Interface {

/// The 128 values of a raw readout: big-endian 16-bit numbers, those above 0xF800 negative. The first and the
/// last sensor element carry no reading of their own and repeat their neighbour.
std::array<std::int32_t, Protocol::ReadoutValues> ReadoutFromBytes(
    std::span<const std::uint8_t, Protocol::ReadoutBytes> bytes);

}  // namespace Varnholt::Interface
