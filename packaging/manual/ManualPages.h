#pragma once

#include <filesystem>
#include <vector>

#include "CommandDescription.h"

namespace Varnholt::Manual {

/// Writes PROGRAM.1, and PROGRAM-COMMAND.1 for each of its commands, into the folder. `others` are pages that
/// the program's own refers to.
void WriteManualPages(const CommandDescription& program, const std::vector<std::string>& others,
                      const std::filesystem::path& folder);

}  // namespace Varnholt::Manual
