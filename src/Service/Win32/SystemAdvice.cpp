#include "Service/SystemAdvice.h"

#include <fmt/format.h>

#include "Service/Finding.h"

namespace Varnholt::Service {

namespace SystemAdvice {
const char* const NoneIsFound = "`ostra doctor` looks for the reason";
const char* const NoPermission = "`ostra doctor` names the reason and the fix";
const char* const TransferFailed = "try again; if it stays, `ostra doctor`";
}  // namespace SystemAdvice

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
