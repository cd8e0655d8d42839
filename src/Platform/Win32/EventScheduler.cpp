#include "Platform/EventScheduler.h"

#include <utility>

#include "Platform/RealScheduler.h"

namespace Varnholt::Platform {

EventScheduler& ClockScheduler() {
    // Never destroyed: that would be at the unloading of a library, when no thread can be waited for.
    static auto& scheduler =
        *new RealScheduler([](std::function<void()> run) { return std::thread(std::move(run)); });
    return scheduler;
}

}  // namespace Varnholt::Platform
