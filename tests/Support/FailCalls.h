#pragma once

#include "Platform/CallFilter.h"
#include "Platform/ErrorCodes.h"

namespace Varnholt::Tests {

/// Platform calls of this name fail from now on, or the one that is so many calls from now alone.
inline void FailCalls(std::string_view name, Platform::ErrorCode code = Platform::Errors::NoSystemResources,
                      int time = 0) {
    Platform::InstallCallFilter([=, calls = 0](std::string_view call) mutable {
        return call == name && (time == 0 || ++calls == time) ? code : Platform::Errors::Success;
    });
}

}  // namespace Varnholt::Tests
