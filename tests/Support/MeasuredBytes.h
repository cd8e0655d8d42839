#pragma once

#include <cstdint>
#include <vector>

#include "Commands.h"

namespace Varnholt::Tests {

/// The first bytes of the measurement that an instrument has started last.
inline std::vector<std::uint8_t> MeasuredBytes(Simulator::Commands& commands, std::size_t length) {
    Simulator::AnswerStream stream = commands.Answers();
    stream.StartMeasurement(commands.NextExposure(), commands.measurements - 1, length);
    std::vector<std::uint8_t> bytes(length);
    EXPECT_EQ(stream.Take(bytes.data(), static_cast<std::uint32_t>(length)), length);
    return bytes;
}

}  // namespace Varnholt::Tests
