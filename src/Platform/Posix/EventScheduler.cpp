#include "Platform/EventScheduler.h"

#include "Platform/Posix/Clock.h"

namespace Varnholt::Platform {

EventScheduler& ClockScheduler() {
    return Posix::CurrentClock().Scheduler();
}

}  // namespace Varnholt::Platform
