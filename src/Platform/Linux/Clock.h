#pragma once

#include <condition_variable>
#include <cstdint>
#include <limits>
#include <memory>
#include <mutex>

#include "Platform/CompletionSource.h"
#include "Platform/EventScheduler.h"
#include "Platform/Time.h"

namespace Varnholt::Platform::Linux {

class BlockedCall;
class ChangeCount;
class ThreadRecord;

/// Microseconds of the clock in force; a clock's origin is its own.
using Microseconds = std::uint64_t;
inline constexpr Microseconds Never = std::numeric_limits<Microseconds>::max();

/// What a thread waits at. There is a fixed number of them, which are never destroyed: one takes no
/// memory and can be notified after its thread has ended. Threads may share one, so all who wait are woken,
/// and look.
using WakeCondition = std::condition_variable*;

/// The dispatcher lock, held. See Dispatcher.h.
class DispatcherLock final : private std::unique_lock<std::mutex> {
  public:
    DispatcherLock();
    ~DispatcherLock();
    DispatcherLock(const DispatcherLock&) = delete;
    DispatcherLock& operator=(const DispatcherLock&) = delete;

    using std::unique_lock<std::mutex>::lock;
    void unlock();

    /// Waits on `condition` until `predicate` holds, and not beyond `end`; the lock is let go of meanwhile.
    template <class Predicate>
    void Wait(std::condition_variable& condition, Predicate predicate) {
        NotifyDeferred();
        condition.wait(*this, predicate);
    }
    template <class Predicate, class TimePoint>
    void Wait(std::condition_variable& condition, TimePoint end, Predicate predicate) {
        NotifyDeferred();
        condition.wait_until(*this, end, predicate);
    }

    /// Of whoever has the lock: notifies when it is let go of. At once, it would wake a thread only for it to
    /// wait for the lock.
    static void NotifyOnRelease(const WakeCondition& condition);
    /// The same for a thread that handles the events of `source`.
    static void InterruptOnRelease(const std::shared_ptr<CompletionSource>& source);

  private:
    static void NotifyDeferred();
};

/// What every blocking call goes through. The operations that take a `DispatcherLock` are called with the
/// dispatcher lock held and return with it held; while they block they let go of it.
class Clock {
  public:
    virtual ~Clock() = default;

    /// Whether threads run one at a time, and hand over in the calls below.
    virtual bool IsCooperative() const = 0;

    /// Any thread, with or without the dispatcher lock.
    virtual Microseconds Now() = 0;
    virtual WallTime Wall() = 0;
    virtual EventScheduler& Scheduler() = 0;

    /// Returns once `call` was woken or the time has come, whichever is first.
    virtual void Block(DispatcherLock& hold, BlockedCall& call, Microseconds deadline) = 0;
    /// Lets the blocked call return.
    virtual void Wake(BlockedCall& call) = 0;
    /// As `Block` where another process may have to do something. The caller looks again afterwards, because
    /// this returns in any case: after `period`, or, where one object is waited for, soon after its `changes`
    /// have passed `seen`.
    virtual void BlockOnOtherProcess(DispatcherLock& hold, BlockedCall& call, Microseconds deadline,
                                     Microseconds period, ChangeCount* changes, std::uint32_t seen) = 0;

    /// A platform call begins or has woken somebody: another thread may go first.
    virtual void Preempt(DispatcherLock& /*hold*/) {}
    /// The caller gives up the rest of its time slice.
    virtual void GiveUpSlice(DispatcherLock& hold) = 0;

    /// The life of a thread of `StartThread`. The first is called by its maker and may be undone by the last;
    /// the others by the thread itself.
    virtual void ThreadMade(DispatcherLock& /*hold*/, ThreadRecord& /*thread*/) {}
    virtual void ThreadBegins(DispatcherLock& /*hold*/, ThreadRecord& /*thread*/) {}
    virtual void ThreadEnds(DispatcherLock& /*hold*/, ThreadRecord& /*thread*/) {}
    virtual void ThreadNeverBegan(DispatcherLock& /*hold*/, ThreadRecord& /*thread*/) {}
};

/// The clock in force.
Clock& CurrentClock();
/// Puts another clock in force; null gives the real one back. Only while no other thread is inside a platform
/// call.
void InstallClock(Clock* clock);

/// `timeout` milliseconds from now, `Never` for `Infinite`.
Microseconds DeadlineAfter(std::uint32_t timeout);

}  // namespace Varnholt::Platform::Linux
