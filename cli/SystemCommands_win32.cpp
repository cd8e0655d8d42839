#include <fmt/format.h>

#include "Failure.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {

namespace SystemAdvice {
const char* const NoneIsFound = "the device manager shows whether it is plugged in and has its driver";
const char* const NoPermission = "end other programs that use it, or ask an administrator";
const char* const TransferFailed = "try again; if it stays, unplug the instrument and plug it in again";
}  // namespace SystemAdvice

FailureReport DescribeMissingLock(Platform::ErrorCode code) {
    return {ExitCode::NotAvailable,
            fmt::format("the instrument's lock cannot be had: Windows error {}, {}", code,
                        Platform::ErrorText(code)),
            code == Platform::Errors::AccessDenied ? "another user's program has it: end that program"
                                                   : "try again; if it stays, restart Windows"};
}

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
