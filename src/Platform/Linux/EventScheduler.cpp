#include "Platform/EventScheduler.h"

#include "Platform/Linux/Clock.h"

namespace Varnholt::Platform {

EventScheduler& ClockScheduler() {
    return Linux::CurrentClock().Scheduler();
}

}  // namespace Varnholt::Platform
