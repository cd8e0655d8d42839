#include <fmt/format.h>

#include "Commands/Commands.h"
#include "Failure.h"
#include "SystemCommands.h"
#include "Win32/Diagnosis.h"

namespace Varnholt::Cli {

namespace SystemAdvice {
const char* const NoneIsFound = "`ostra doctor` looks for the reason";
const char* const NoPermission = "`ostra doctor` names the reason and the fix";
const char* const TransferFailed = "try again; if it stays, `ostra doctor`";
}  // namespace SystemAdvice

FailureReport DescribeMissingLock(Platform::ErrorCode code) {
    return {ExitCode::NotAvailable,
            fmt::format("the instrument's lock cannot be had: Windows error {}, {}", code,
                        Platform::ErrorText(code)),
            code == Platform::Errors::AccessDenied ? "another user's program has it: end that program"
                                                   : "try again; if it stays, restart Windows"};
}

std::vector<Finding> Diagnose(Session& session) {
    return DiagnoseDrivers(session);
}

void AddSystemCommands(CommandSpec app, Session& session) {
    AddDoctor(app, session);
}

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
