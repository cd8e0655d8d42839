#pragma once

#include <functional>
#include <string>
#include <vector>

#include "ExitCode.h"
#include "Session.h"

namespace CLI {
class App;
}

namespace Varnholt::Cli {

/// Runs the tool with these arguments (without the program's name) and answers its exit code. Nothing is
/// thrown; every failure has been reported on `err`.
ExitCode RunTool(const std::vector<std::string>& arguments, Streams& streams,
                 Service::Interruption& interruption);

/// Lets `look` see the parser with all commands, as the help describes them; nothing is run.
void ShowCommandLine(const std::function<void(CLI::App& tool)>& look);

}  // namespace Varnholt::Cli
