#include "Service/SystemAdvice.h"

#include <fmt/format.h>

#include "Service/Finding.h"

namespace Varnholt::Service {

const char* const NoInstrumentAdvice = "`ostra doctor` looks for the reason";

Failure DescribeMissingLock(Platform::ErrorCode code) {
    return {FailureKind::NoLock,
            fmt::format("the instrument's lock cannot be had: Windows error {}, {}", code,
                        Platform::ErrorText(code)),
            code == Platform::Errors::AccessDenied ? "another user's program has it: end that program"
                                                   : "try again; if it stays, restart Windows"};
}

std::vector<Finding> Diagnose(Context& context) {
    return DiagnoseDrivers(context);
}

/// The system does not say.
std::string HolderOf(const std::string&) {
    return {};
}

}  // namespace Varnholt::Service
