#include "Platform/RealScheduler.h"

namespace Varnholt::Platform {

/// Alone in a source: ostra.dll must not get the language's clock with it, which Windows XP does not have.
EventScheduler& ClockScheduler() {
    // Never destroyed: that would be at the unloading of a library, when no thread can be waited for.
    static auto& scheduler = *new RealScheduler([](auto run) { return std::thread(std::move(run)); });
    return scheduler;
}

}  // namespace Varnholt::Platform
