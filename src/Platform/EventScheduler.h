#pragma once

#include <cstdint>
#include <functional>
#include <map>

namespace Varnholt::Platform {

/// Calls functions at points in time; what a simulated device uses for everything that takes time.
class EventScheduler {
  public:
    virtual ~EventScheduler() = default;
    /// Microseconds of a clock that only grows.
    virtual std::uint64_t Now() = 0;
    /// Calls `event` once at `time` or as soon after as can be, on a thread of the scheduler's choice, one
    /// event at a time and in order of time, never from inside `CallAt`. `owner` is for `Forget`: any address
    /// that nobody else names.
    virtual void CallAt(std::uint64_t time, std::function<void()> event, const void* owner = nullptr) = 0;
    /// Drops the owner's events that have not been called; while one is being called on another thread, waits
    /// for the end of that call.
    virtual void Forget(const void* owner) = 0;
};

/// The scheduler of the clock in force: real time, or a test's virtual time. Its thread, where it needs one,
/// runs only while events are waiting.
EventScheduler& ClockScheduler();

/// For schedulers: microseconds of the system's own clock.
std::uint64_t SteadyMicroseconds();

/// For schedulers: the events that wait, by their time.
struct ScheduledEvent {
    std::function<void()> call;
    const void* owner;
};
using ScheduledEvents = std::multimap<std::uint64_t, ScheduledEvent>;
/// Moves an owner's events over to `taken`. What they hold may be anything: they are to end without a lock.
void TakeEventsOf(const void* owner, ScheduledEvents& events, ScheduledEvents& taken);

}  // namespace Varnholt::Platform
