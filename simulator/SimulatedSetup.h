#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "FaultPlan.h"
#include "InstrumentSettings.h"

namespace Varnholt::Simulator {

/// The instruments of the library of simulated instruments, and how time passes for it.
struct SimulatedSetup {
    struct Instrument {
        std::string name;
        InstrumentSettings settings;
        FaultPlan faults;
        std::string eepromFile;  ///< keeps the EEPROM; empty: it is forgotten at the end
    };

    std::vector<Instrument> instruments;
    bool isTimeVirtual = false;

    /// Reads a text of words `KEY=VALUE`, separated by spaces and line ends; a value with spaces stands in
    /// double quotes, and `#` begins a comment. `name` begins an instrument, and the words behind it are that
    /// one's: `seed`, `light`, `gain`, `firmware` (old, new), `integrate` (yes, no), `eeprom`, `faults`.
    /// `time` (real, virtual) is for all. A text without a name has one instrument, "1".
    ///
    /// Throws `std::runtime_error` with a text for people.
    static SimulatedSetup Parse(std::string_view text);
};

}  // namespace Varnholt::Simulator
