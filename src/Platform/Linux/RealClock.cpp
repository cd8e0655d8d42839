#include <sched.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <memory>
#include <utility>

#include "Platform/Linux/Dispatcher.h"
#include "Platform/Linux/HostSignalsBlocked.h"
#include "Platform/Linux/NoDestructor.h"
#include "Platform/Linux/SharedContent.h"
#include "Platform/RealScheduler.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform {
namespace Linux {

using std::chrono::steady_clock;

namespace {

/// The death of a process changes nothing that could be awaited, so that is looked for this often.
constexpr Microseconds LongestAwait = 50'000;

/// A scheduler that ends with the library, but not in a forked process, which has none of the threads that
/// would be waited for.
class SchedulerOfProcess final {
  public:
    explicit SchedulerOfProcess(RealScheduler::Starter startThread)
        : scheduler_(std::make_unique<RealScheduler>(startThread)) {}
    ~SchedulerOfProcess() {
        if (getpid() != process_) {
            (void)scheduler_.release();
        }
    }
    SchedulerOfProcess(const SchedulerOfProcess&) = delete;
    SchedulerOfProcess& operator=(const SchedulerOfProcess&) = delete;

    RealScheduler& operator*() { return *scheduler_; }

  private:
    const pid_t process_ = getpid();
    std::unique_ptr<RealScheduler> scheduler_;
};

/// The system's time; threads run as the system schedules them.
class RealClock final : public Clock {
  public:
    bool IsCooperative() const override { return false; }

    Microseconds Now() override { return SteadyMicroseconds(); }

    WallTime Wall() override {
        const auto now = std::chrono::floor<std::chrono::milliseconds>(std::chrono::system_clock::now());
        const auto seconds = std::chrono::floor<std::chrono::seconds>(now);
        return {seconds.time_since_epoch().count(), static_cast<std::uint16_t>((now - seconds).count())};
    }

    EventScheduler& Scheduler() override {
        static SchedulerOfProcess scheduler([](std::function<void()> run) {
            const HostSignalsBlocked blocked;
            return std::thread([run = std::move(run)] {
                // Events are for their time, not for up to 50 us later.
                constexpr unsigned long ExactTimers = 1;
                prctl(PR_SET_TIMERSLACK, ExactTimers);
                run();
            });
        });
        return *scheduler;
    }

    void Block(DispatcherLock& hold, BlockedCall& call, Microseconds deadline) override {
        while (!call.woken && Now() < deadline && HandleEvents(hold, call, deadline)) {
        }
        const auto woken = [&call] { return call.woken; };
        if (deadline == Never) {
            hold.Wait(*call.thread.turn, woken);
        } else {
            const steady_clock::time_point end{std::chrono::microseconds(deadline)};
            hold.Wait(*call.thread.turn, end, woken);
        }
    }

    void Wake(BlockedCall& call) override {
        call.woken = true;
        if (!call.handlesEvents) {
            DispatcherLock::NotifyOnRelease(call.thread.turn);
        } else if (!IsCurrentThread(call.thread)) {
            DispatcherLock::InterruptOnRelease(call.source);
        }
    }

    void BlockOnOtherProcess(DispatcherLock& hold, BlockedCall& call, Microseconds deadline,
                             Microseconds period, ChangeCount* changes, std::uint32_t seen) override {
        const Microseconds now = Now();
        if (changes && deadline > now) {
            hold.unlock();
            changes->Await(seen, std::min(deadline - now, LongestAwait));
            hold.lock();
        } else {
            Block(hold, call, std::min(deadline, now + period));
        }
    }

    void GiveUpSlice(DispatcherLock& hold) override {
        hold.unlock();
        sched_yield();
        hold.lock();
    }

  private:
    /// False when there are no events for the thread to handle.
    static bool HandleEvents(DispatcherLock& hold, BlockedCall& call, Microseconds deadline) {
        if (!call.source || !call.source->TryBegin()) {
            return false;
        }
        call.handlesEvents = true;
        hold.unlock();
        call.source->HandleEvents(deadline);
        hold.lock();
        call.handlesEvents = false;
        return true;
    }
};

std::atomic<Clock*> installedClock = nullptr;

}  // namespace

Clock& CurrentClock() {
    static NoDestructor<RealClock> realClock;
    Clock* const clock = installedClock.load(std::memory_order_acquire);
    return clock ? *clock : *realClock;
}

void InstallClock(Clock* clock) {
    installedClock.store(clock, std::memory_order_release);
}

Microseconds DeadlineAfter(std::uint32_t timeout) {
    return timeout == Infinite ? Never : CurrentClock().Now() + Microseconds{timeout} * 1000;
}

}  // namespace Linux

EventScheduler& ClockScheduler() {
    return Linux::CurrentClock().Scheduler();
}

}  // namespace Varnholt::Platform
