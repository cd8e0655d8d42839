#pragma once

#include <pthread.h>

#include <atomic>
#include <condition_variable>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "Platform/Linux/Clock.h"
#include "Platform/Linux/Dispatcher.h"
#include "VirtualClock.h"

namespace Varnholt::Simulator {

using Platform::EventScheduler;
using Platform::WallTime;
using Platform::Linux::BlockedCall;
using Platform::Linux::Clock;
using Platform::Linux::DispatcherLock;
using Platform::Linux::Microseconds;
using Platform::Linux::ThreadRecord;
using Platform::Linux::WaitableObject;

/// The clock behind `VirtualClock`. Its members are guarded by the dispatcher lock.
///
/// Who may run is passed on like a baton: the record of the thread that has it is in state `Running`, and a
/// thread whose record is not waits at its own condition variable. Whoever finds that nobody is `Ready` moves
/// the time on and sees to the event that is due. One that holds no lock calls it on its own stack, which
/// saves two changes of threads, but under a record of the event's own. One that holds a lock leaves it to a
/// thread for events: an event that needs the lock could not wait for it on the stack of its owner.
class VirtualTime final : public Clock, private EventScheduler {
  public:
    explicit VirtualTime(std::uint64_t seed);
    ~VirtualTime() override;
    VirtualTime(const VirtualTime&) = delete;
    VirtualTime& operator=(const VirtualTime&) = delete;

    Microseconds Elapsed() const { return now_ - Start; }
    void HandleDeadlock(VirtualClock::DeadlockHandler handler);

    bool IsCooperative() const override { return true; }
    Microseconds Now() override { return now_; }
    WallTime Wall() override;
    EventScheduler& Scheduler() override { return *this; }

    void Block(DispatcherLock& hold, BlockedCall& call, Microseconds deadline) override;
    void Wake(BlockedCall& call) override;
    void BlockOnOtherProcess(DispatcherLock& hold, BlockedCall& call, Microseconds deadline,
                             Microseconds period, WaitableObject* only, std::uint32_t seen) override;
    void Preempt(DispatcherLock& hold) override;
    void GiveUpSlice(DispatcherLock& hold) override;
    void ThreadMade(DispatcherLock& hold, ThreadRecord& thread) override;
    void ThreadBegins(DispatcherLock& hold, ThreadRecord& thread) override;
    void ThreadEnds(DispatcherLock& hold, ThreadRecord& thread) override;
    void ThreadNeverBegan(DispatcherLock& hold, ThreadRecord& thread) override;

  private:
    using State = ThreadRecord::State;

    EventId CallAt(std::uint64_t time, std::function<void()> event) override;
    void Forget(EventId id) override;

    bool IsDue(const ThreadRecord& thread) const;
    ThreadRecord* ChooseReady();
    std::uint64_t Random();
    void HandOver(DispatcherLock& hold, ThreadRecord& self);
    void AwaitTurn(DispatcherLock& hold, ThreadRecord& self);
    void Advance(DispatcherLock& hold, ThreadRecord& self);
    bool CanHost(const ThreadRecord& thread);
    void HostEvent(DispatcherLock& hold, ThreadRecord& host);
    void CallEvent(DispatcherLock& hold, ThreadRecord& as);
    void PassOn();
    static void* RunEventThread(void* time);
    void ServeEvents(DispatcherLock& hold);
    void ReportDeadlock(DispatcherLock& hold);
    std::string DescribeThreads() const;

    /// Not 0, which could be taken for no time at all.
    static constexpr Microseconds Start = 1'000'000;

    std::atomic<Microseconds> now_ = Start;
    std::uint64_t randomState_;
    ThreadRecord& installer_;
    ThreadRecord hostedEvent_;
    std::vector<ThreadRecord*> threads_;  ///< in the order in which they were made
    std::size_t threadsAtRest_;           ///< of `threads`, without those that `StartThread` has started

    ThreadRecord eventThread_;
    pthread_t systemEventThread_{};
    bool hasEventThread_ = false;
    bool eventThreadMustCall_ = false;
    bool eventThreadMustEnd_ = false;

    std::map<std::pair<Microseconds, EventId>, std::function<void()>> events_;
    EventId running_ = 0;
    const ThreadRecord* runningAs_ = nullptr;
    std::condition_variable eventEnded_;     ///< for threads that do not take turns
    std::vector<BlockedCall*> forgetting_;   ///< wait for the running event's end
    BlockedCall* awaitingEnd_ = nullptr;     ///< of the clock's own end
    VirtualClock::DeadlockHandler handler_;  ///< may be empty
};

}  // namespace Varnholt::Simulator
