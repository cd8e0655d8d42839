#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "FaultPlan.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Tests {

/// What came out of one run: nothing, or the text of what failed.
using Outcome = std::optional<std::string>;
using Bytes = std::vector<std::uint8_t>;

/// One operation of the library, to be run with faults.
struct Operation {
    const char* name;
    /// Opens the instrument, does its work, closes it.
    std::function<Outcome()> run;
    std::uint64_t scanBytes = Protocol::ReadoutBytes;
    /// As an open-ended scan does, so that it cannot tell a fault from its end.
    bool endsWithShortTransfer = false;

    /// The EEPROM before each run, and what must hold of it after one with `fault` at a transfer of
    /// `endpoint`. Empty: it does not matter.
    Bytes eeprom = {};
    std::function<void(const Bytes& after, const Simulator::Fault& fault, std::uint8_t endpoint)> check = {};
};

/// Those of the memory model: whatever fails, a log is left and nothing else is touched.
std::vector<Operation> MemoryOperations();

}  // namespace Varnholt::Tests
