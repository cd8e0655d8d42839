#pragma once

#include <optional>
#include <string>
#include <vector>

#include "Service/Context.h"

namespace Varnholt::Service {

/// The identifiers of the instruments that are connected, as the context's transport names them.
std::vector<std::string> ListInstruments(const Context& context);
/// For who is reporting a failure: throws nothing, and takes what cannot be listed for connected.
bool IsConnected(const Context& context, const std::string& identifier);

/// What people call an instrument: its place or serial number, without the driver's part of the identifier.
std::string ShortNameOf(const std::string& identifier);

/// One of the instruments that are connected.
struct FoundInstrument {
    std::vector<std::string> connected;
    std::size_t index = 0;

    const std::string& Identifier() const { return connected[index]; }
};

/// The instrument that `name` means: the one with that identifier, else the one with that short name, else
/// the only one whose identifier ends so; "chip:" and 16 hexadecimal digits mean the one whose chip answers
/// so, which is asked. Empty: the first. Throws `Failure`.
FoundInstrument FindInstrument(Context& context, const std::string& name);
/// The same among these, without chips.
std::size_t FindInstrument(const std::vector<std::string>& identifiers, const std::string& name);

/// What one instrument answered when it was asked for its chip id.
struct ChipIdAnswer {
    std::string chipId;              ///< empty: it could not be asked
    std::optional<Failure> problem;  ///< then
};
/// Opens the instrument, and thereby resets it. Throws only what ends everything: an interruption.
ChipIdAnswer AskChipId(Context& context, const std::string& identifier);

}  // namespace Varnholt::Service
