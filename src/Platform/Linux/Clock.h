#pragma once

#include <condition_variable>
#include <cstdint>
#include <limits>
#include <memory>
#include <mutex>

#include "Platform/EventScheduler.h"
#include "Platform/Time.h"

namespace Varnholt::Platform::Linux {

class BlockedCall;
class CompletionSource;
class ThreadRecord;
class WaitableObject;

/// Microseconds of the clock in force; a clock's origin is its own.
using Microseconds = std::uint64_t;
inline constexpr Microseconds Never = std::numeric_limits<Microseconds>::max();

/// What a thread waits at. There is a fixed number of them, which are never destroyed: a bell takes no memory
/// and can be rung after its thread has ended. Threads may share one, so all who wait are woken, and look.
using Bell = std::condition_variable*;

/// The kernel lock, held. See Kernel.h.
class KernelHold final : private std::unique_lock<std::mutex> {
  public:
    KernelHold();
    ~KernelHold();
    KernelHold(const KernelHold&) = delete;
    KernelHold& operator=(const KernelHold&) = delete;

    using std::unique_lock<std::mutex>::lock;
    void unlock();

    /// Waits on `bell` until `condition` holds, and not beyond `end`; the lock is let go of meanwhile.
    template <class Condition>
    void Wait(std::condition_variable& bell, Condition condition) {
        RingKept();
        bell.wait(*this, condition);
    }
    template <class Condition, class TimePoint>
    void Wait(std::condition_variable& bell, TimePoint end, Condition condition) {
        RingKept();
        bell.wait_until(*this, end, condition);
    }

    /// Of whoever has the lock: rings when it is let go of. Rung at once, the bell would wake a thread only
    /// for it to wait for the lock.
    static void RingOnRelease(const Bell& bell);
    /// The same for a thread that works off `source`.
    static void InterruptOnRelease(const std::shared_ptr<CompletionSource>& source);

  private:
    static void RingKept();
};

/// What every blocking call goes through. The operations that take a `KernelHold` are called with the kernel
/// lock held and return with it held; while they block they let go of it.
class Clock {
  public:
    virtual ~Clock() = default;

    /// Whether threads run one at a time, and hand over in the calls below.
    virtual bool TakesTurns() const = 0;

    /// Any thread, with or without the kernel lock.
    virtual Microseconds Now() = 0;
    virtual WallTime Wall() = 0;
    virtual EventScheduler& Scheduler() = 0;

    /// Returns once `call` was woken or the time has come, whichever is first.
    virtual void Block(KernelHold& hold, BlockedCall& call, Microseconds deadline) = 0;
    /// Lets the blocked call return.
    virtual void Wake(BlockedCall& call) = 0;
    /// As `Block` where another process may have to do something. The caller looks again afterwards, because
    /// this returns in any case: after `period` unless `only` is set, the one object that is waited for,
    /// whose changes are `seen`.
    virtual void BlockOnOtherProcess(KernelHold& hold, BlockedCall& call, Microseconds deadline,
                                     Microseconds period, WaitableObject* only, std::uint32_t seen) = 0;

    /// A platform call begins or has woken somebody: another thread may go first.
    virtual void Preempt(KernelHold& hold) = 0;
    /// The caller gives up the rest of its time slice.
    virtual void GiveUpSlice(KernelHold& hold) = 0;

    /// The life of a thread of `StartThread`. The first is called by its maker and may be undone by the last;
    /// the others by the thread itself.
    virtual void ThreadMade(KernelHold& hold, ThreadRecord& thread) = 0;
    virtual void ThreadBegins(KernelHold& hold, ThreadRecord& thread) = 0;
    virtual void ThreadEnds(KernelHold& hold, ThreadRecord& thread) = 0;
    virtual void ThreadNeverBegan(KernelHold& hold, ThreadRecord& thread) = 0;
};

/// The clock in force.
Clock& CurrentClock();
/// Puts another clock in force; null gives the real one back. Only while no other thread is inside a platform
/// call.
void InstallClock(Clock* clock);

/// `timeout` milliseconds from now, `Never` for `Infinite`.
Microseconds DeadlineAfter(std::uint32_t timeout);

}  // namespace Varnholt::Platform::Linux
