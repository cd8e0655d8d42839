#pragma once

#include <functional>
#include <string_view>

#include "Platform/ErrorCodes.h"

namespace Varnholt::Platform {

/// Lets a test make any platform call that can fail fail. The filter is asked with the call's name
/// ("MakeMutex", "StartThread", "Open"...) before the call is carried out; an answer other than
/// `Errors::Success` makes the call fail with that code without touching the system. An empty function
/// removes the filter. It may be asked by several threads at once, and once more just after it was removed.
using CallFilter = std::function<ErrorCode(std::string_view call)>;
void InstallCallFilter(CallFilter filter);

/// For the implementations: true when the named call must fail now; `LastError` is then set.
bool CallMustFail(std::string_view call);

}  // namespace Varnholt::Platform
