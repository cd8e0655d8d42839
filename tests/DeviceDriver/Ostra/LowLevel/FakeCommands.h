#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Bytes = std::vector<std::uint8_t>;

/// What the fake instrument keeps, and how it misbehaves; owned by the test.
struct FakeInstrument {
    Bytes eeprom{};
    std::vector<std::string> commands{};  ///< "GetMISC", "write 256+40"

    std::uint16_t p1 = 0, p2 = 0, p3 = 0;
    std::uint8_t p4 = 0, p5 = 0;
    std::uint8_t misc1 = 0, misc3 = 0;
    std::uint16_t misc2 = 0, misc4 = 0, misc5 = 0;
    std::uint8_t mode = 0;
    /// The six answers to `GetMeasureMode` in the current mode.
    std::function<std::array<std::uint8_t, 6>(std::uint8_t mode)> describeMode{};

    std::uint32_t missing = 0;  ///< bytes that a read of the EEPROM ends too early
    /// The command with this index fails with `IOException`.
    std::size_t failingCommand = ~std::size_t{0};

    /// With blanks between them.
    std::string TakeCommands();
};

/// A command set whose transport is the fake; its opening reset is not among the commands.
Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionality> Open(FakeInstrument& instrument);

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
