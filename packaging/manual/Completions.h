#pragma once

#include <functional>
#include <string>

#include "CommandDescription.h"

namespace Varnholt::Manual {

// Completion scripts: commands, options, values of options that have a fixed set, files, and instruments that
// are connected, which the script asks the tool for.

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

}  // namespace Varnholt::Manual
