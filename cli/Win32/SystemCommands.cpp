#include "SystemCommands.h"

#include "Commands/AllCommands.h"
#include "ExitCode.h"

namespace Varnholt::Cli {

void AddSystemCommands(CommandSpec app, Session& session) {
    AddDoctor(app, session);
}

void PrintCandidates(Session&, bool) {
    throw Failure(FailureKind::BadArgument, "Windows shows its USB devices in the device manager",
                  "an instrument is recognised by the interface class that its driver registers");
}

std::unique_ptr<TrafficRecording> RecordTraffic(const std::string&) {
    throw Failure(FailureKind::BadArgument,
                  "--capture is not available on Windows: the traffic is the drivers' own",
                  "a USB protocol analyser for Windows records it");
}

}  // namespace Varnholt::Cli
