#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

namespace Varnholt::Simulator {

class VirtualTime;

/// For tests: replaces the time of the whole platform layer by one that passes only while every thread waits.
/// A time-out of five seconds costs microseconds, and what happens in which order is repeatable. Linux only.
///
/// The clock's threads are the one that made it and those that `StartThread` starts meanwhile. Exactly one of
/// them runs at a time; a platform call may hand over to another that could run, as the seed decides. When
/// all wait, the time jumps to the earliest time-out or event of `ClockScheduler`; a tie is decided by the
/// seed. An event is called as if by a thread of its own, often on a waiting thread's stack. Sleeps, waits,
/// tick count, high-resolution counter, wall clock and events all follow this time; `SleepMilliseconds(0)`
/// with nobody else to run takes a microsecond, so that a loop that polls comes to an end.
///
/// What the clock asks of the code under test: a thread that waits for another does so by platform calls, and
/// no lock but those of the platform (`RecursiveMutex`, a mutex) is held across a platform call that can
/// block or hand over: waits, sleeps, signals, releases, `StartThread`. (`CallAt`, `Forget` and the time
/// queries do not hand over.) Other threads, such as `std::thread`s, may signal and poll but not block.
///
/// Named objects that are made under this clock are the process's own.
///
/// One at a time; made and ended while no other thread is inside a platform call. The end waits, in virtual
/// time, for the clock's threads to end, and drops the events that are left.
class VirtualClock final {
  public:
    explicit VirtualClock(std::uint64_t seed);
    ~VirtualClock();
    VirtualClock(const VirtualClock&) = delete;
    VirtualClock& operator=(const VirtualClock&) = delete;

    /// Virtual time since the clock was made. Also `ClockScheduler().Now()` follows it, with another origin.
    std::uint64_t ElapsedMicroseconds() const;
    std::uint64_t ElapsedMilliseconds() const { return ElapsedMicroseconds() / 1000; }

    /// Called when every thread waits and nothing can ever end a wait, with a line for each thread that says
    /// what it waits for. When it returns, the waits answer `Failed`. Without a handler the report goes to
    /// the error stream and the process is aborted. Throws nothing.
    using DeadlockHandler = std::function<void(const std::string& report)>;
    void HandleDeadlock(DeadlockHandler handler);

  private:
    const std::unique_ptr<VirtualTime> time_;
};

}  // namespace Varnholt::Simulator
