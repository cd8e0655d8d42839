#pragma once

#include <string>
#include <vector>

#include "Instrument.h"

namespace Varnholt::Cli {

/// What one instrument answered when it was asked for its chip id.
struct ChipIdAnswer {
    std::string chipId;     ///< empty: it could not be asked
    FailureReport problem;  ///< then; it names the instrument
};

/// Opens the instrument, and thereby resets it. Throws only what ends the command: an interruption.
ChipIdAnswer AskChipId(Session& session, const std::string& identifier, const std::string& transport);

/// Whether a device is named by its chip: "chip:5a0123456789abcd".
bool NamesChip(const std::string& device);

/// The identifier of the instrument with the chip that `options` name. They are asked one after the other, up
/// to the one that fits. Throws `ToolFailure`.
std::string FindByChipId(Session& session, const std::vector<std::string>& identifiers,
                         const InstrumentOptions& options);

}  // namespace Varnholt::Cli
