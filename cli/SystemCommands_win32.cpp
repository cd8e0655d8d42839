#include "Failure.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {

void AddSystemCommands(CLI::App&, Session&) {}

void PrintCandidates(Session&, bool) {
    throw ToolFailure(ExitCode::Usage, "Windows shows its USB devices in the device manager",
                      "an instrument is recognised by the interface class that its driver registers");
}

}  // namespace Varnholt::Cli
