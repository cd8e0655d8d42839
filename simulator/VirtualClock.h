#pragma once

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "Platform/EventScheduler.h"
#include "Platform/Linux/Clock.h"
#include "Platform/Linux/Dispatcher.h"

namespace Varnholt::Simulator {

namespace Linux = Platform::Linux;

/// For tests: replaces the time of the whole platform layer by one that passes only while every thread waits.
/// A time-out of five seconds costs microseconds, and what happens in which order is repeatable. Linux only.
///
/// The clock's threads are the one that made it and those that `StartThread` starts meanwhile. Exactly one of
/// them runs at a time; a platform call may hand over to another that could run, as the seed decides. When
/// all wait, the time jumps to the earliest time-out or event of `ClockScheduler`; a tie is decided by the
/// seed. Events are called on a thread of their own, which is there from the first of them on. Sleeps, waits,
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
class VirtualClock final : private Linux::Clock, private Platform::EventScheduler {
  public:
    explicit VirtualClock(std::uint64_t seed);
    ~VirtualClock() override;
    VirtualClock(const VirtualClock&) = delete;
    VirtualClock& operator=(const VirtualClock&) = delete;

    /// Virtual time since the clock was made. Also `ClockScheduler().Now()` follows it, with another origin.
    std::uint64_t ElapsedMicroseconds() const { return now_ - Start; }
    std::uint64_t ElapsedMilliseconds() const { return ElapsedMicroseconds() / 1000; }

    /// Called when every thread waits and nothing can ever end a wait, with a line for each thread that says
    /// what it waits for. When it returns, the waits answer `Failed`. Without a handler the report goes to
    /// the error stream and the process is aborted. Throws nothing.
    using DeadlockHandler = std::function<void(const std::string& report)>;
    void HandleDeadlock(DeadlockHandler handler);

  private:
    using State = Linux::ThreadRecord::State;

    bool IsCooperative() const override { return true; }
    Linux::Microseconds Now() override { return now_; }
    Platform::WallTime Wall() override;
    Platform::EventScheduler& Scheduler() override { return *this; }
    void Block(Linux::DispatcherLock& hold, Linux::BlockedCall& call, Linux::Microseconds deadline) override;
    void Wake(Linux::BlockedCall& call) override;
    void BlockOnOtherProcess(Linux::DispatcherLock& hold, Linux::BlockedCall& call,
                             Linux::Microseconds deadline, Linux::Microseconds period,
                             Linux::ChangeCount* changes, std::uint32_t seen) override;
    void Preempt(Linux::DispatcherLock& hold) override;
    void GiveUpSlice(Linux::DispatcherLock& hold) override;
    void ThreadMade(Linux::DispatcherLock& hold, Linux::ThreadRecord& thread) override;
    void ThreadBegins(Linux::DispatcherLock& hold, Linux::ThreadRecord& thread) override;
    void ThreadEnds(Linux::DispatcherLock& hold, Linux::ThreadRecord& thread) override;
    void ThreadNeverBegan(Linux::DispatcherLock& hold, Linux::ThreadRecord& thread) override;

    void CallAt(std::uint64_t time, std::function<void()> event, const void* owner) override;
    void Forget(const void* owner) override;

    // Who may run is passed on like a baton: the record of the thread that has it is in state `Running`, and
    // a thread whose record is not waits at its own condition variable. Whoever finds that nobody is `Ready`
    // moves the time on. All with the dispatcher lock held.
    Linux::ThreadRecord* ChooseReady();
    std::uint64_t Random();
    void HandOver(Linux::DispatcherLock& hold, Linux::ThreadRecord& self);
    void AwaitTurn(Linux::DispatcherLock& hold, Linux::ThreadRecord& self);
    void Advance(Linux::DispatcherLock& hold);
    void PassOn();
    void ReportDeadlock(Linux::DispatcherLock& hold);
    std::string DescribeThreads() const;
    void WakeIfAtRest();
    bool IsAtRest() const;

    void RunEventThread();
    void CallFirstEvent(Linux::DispatcherLock& hold);
    void AwaitFirstEvent();
    void DropEventsOf(const void* owner, Platform::ScheduledEvents& dropped);

    /// Not 0, which could be taken for no time at all.
    static constexpr Linux::Microseconds Start = 1'000'000;

    // Guarded by the dispatcher lock.
    std::atomic<Linux::Microseconds> now_ = Start;
    std::uint64_t randomState_;
    Linux::ThreadRecord& installer_;
    std::vector<Linux::ThreadRecord*> threads_;   ///< in the order in which they were made
    Linux::BlockedCall* awaitingRest_ = nullptr;  ///< of the clock's own end
    DeadlockHandler handler_;                     ///< may be empty

    Platform::ScheduledEvents events_;
    std::thread eventThread_;
    Linux::ThreadRecord eventRecord_;
    bool isCalling_ = false;
    const void* ownerOfCall_ = nullptr;
    bool eventThreadMustEnd_ = false;
    std::condition_variable callEnded_;            ///< for threads that do not take turns
    std::vector<Linux::BlockedCall*> forgetting_;  ///< wait for the end of the running call
};

}  // namespace Varnholt::Simulator
