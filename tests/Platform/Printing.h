#pragma once

#include <ostream>

#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform {

inline void PrintTo(WaitResult result, std::ostream* stream) {
    *stream << (result == WaitResult::Signalled   ? "Signalled"
                : result == WaitResult::Abandoned ? "Abandoned"
                : result == WaitResult::TimedOut  ? "TimedOut"
                                                  : "Failed");
}

}  // namespace Varnholt::Platform
