#pragma once

#include <cstdint>
#include <functional>

namespace Varnholt::Platform {

/// Calls functions at points in time; what a simulated device uses for everything that takes time.
class EventScheduler {
  public:
    using EventId = std::uint64_t;

    virtual ~EventScheduler() = default;
    /// Microseconds of a clock that only grows.
    virtual std::uint64_t Now() = 0;
    /// Calls `event` once at `time` or as soon after as can be, on a thread of the scheduler's choice, one
    /// event at a time and in order of time, never from inside `CallAt`. The result names it for `Forget`;
    /// never 0.
    virtual EventId CallAt(std::uint64_t time, std::function<void()> event) = 0;
    /// Drops an event that has not been called; when it is being called on another thread, returns after that
    /// call.
    virtual void Forget(EventId id) = 0;
};

/// The scheduler of the clock in force: real time, or a test's virtual time. Its thread, where it needs one,
/// runs only while events are waiting.
EventScheduler& ClockScheduler();

}  // namespace Varnholt::Platform
