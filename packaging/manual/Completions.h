#pragma once

#include <functional>
#include <string>

#include "CommandDescription.h"

namespace Varnholt::Manual {

// Completion scripts: commands, options, values of options that have a fixed set, files, instruments that are
// connected, and devices that could be registered: the script asks the tool for both.

std::string BashCompletion(const CommandDescription& program);
std::string ZshCompletion(const CommandDescription& program);
std::string FishCompletion(const CommandDescription& program);

/// For the three of them: the program's name, or a command's with those before it, with `separator` between.
std::string PathOf(const CommandDescription& command, const std::string& separator);
/// Calls `visit` for the command and for all below it.
void VisitAll(const CommandDescription& command,
              const std::function<void(const CommandDescription& found)>& visit);
/// The texts, each behind a blank but the first.
std::string Joined(const std::vector<std::string>& texts);
/// A name that a shell's function can have.
std::string FunctionName(const CommandDescription& command);
/// Shell: prints the instruments' names, one a line.
inline constexpr const char* ListInstruments = "ostra list 2>/dev/null | sed -n '1!s/ .*//p'";
/// Shell: prints vendor and product numbers of what could be an instrument, one pair a line.
inline constexpr const char* ListCandidates =
    "ostra list --candidates 2>/dev/null | sed -nE '1!s/^[^ ]+ +([^ ]+).*/\\1/p'";

}  // namespace Varnholt::Manual
