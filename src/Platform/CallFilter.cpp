#include "Platform/CallFilter.h"

#include <utility>

namespace Varnholt::Platform {
namespace {
CallFilter installedFilter;
}

void InstallCallFilter(CallFilter filter) {
    installedFilter = std::move(filter);
}

bool CallMustFail(std::string_view call) {
    if (!installedFilter) {
        return false;
    }
    const ErrorCode code = installedFilter(call);
    if (code == Errors::Success) {
        return false;
    }
    SetLastError(code);
    return true;
}

}  // namespace Varnholt::Platform
