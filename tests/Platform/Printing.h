#pragma once

#include <ostream>

#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform {

inline void PrintTo(WaitResult result, std::ostream* stream) {
    switch (result) {
        case WaitResult::Signalled:
            *stream << "Signalled";
            return;
        case WaitResult::Abandoned:
            *stream << "Abandoned";
            return;
        case WaitResult::TimedOut:
            *stream << "TimedOut";
            return;
        case WaitResult::Failed:
            *stream << "Failed";
            return;
    }
    *stream << "wait result " << static_cast<std::uint32_t>(result);
}

}  // namespace Varnholt::Platform
