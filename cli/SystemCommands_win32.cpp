#include "Failure.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {

void AddSystemCommands(CommandSpec, Session&) {}

void PrintCandidates(Session&, bool) {
    throw ToolFailure(ExitCode::Usage, "Windows shows its USB devices in the device manager",
                      "an instrument is recognised by the interface class that its driver registers");
}

std::unique_ptr<TrafficRecording> RecordTraffic(const std::string&) {
    throw ToolFailure(ExitCode::Usage,
                      "--capture is not available on Windows: the traffic is the drivers' own",
                      "a USB protocol analyser for Windows records it");
}

}  // namespace Varnholt::Cli
