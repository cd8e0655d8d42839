#pragma once

#include <string>
#include <vector>

#include "ExitCode.h"
#include "Session.h"

namespace Varnholt::Cli {

/// Runs the tool with these arguments (without the program's name) and answers its exit code. Nothing is
/// thrown; every failure has been reported on `err`.
ExitCode RunTool(const std::vector<std::string>& arguments, Streams& streams,
                 Service::Interruption& interruption);

}  // namespace Varnholt::Cli
