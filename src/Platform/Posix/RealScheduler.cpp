#include "Platform/Posix/RealScheduler.h"

#include <sched.h>
#include <sys/prctl.h>

#include <algorithm>
#include <atomic>
#include <chrono>

#include "Platform/Posix/RealClock.h"
#include "Platform/Posix/SystemThread.h"

namespace Varnholt::Platform::Posix {
namespace {

constexpr Microseconds LongestStep = 3'600'000'000;

/// How long after a waiting thread has called an event the own thread leaves events to the next wait.
constexpr Microseconds Patience = 2'000;

/// The system ends a sleep up to this much late. A thread that waits for what an event does spends the rest
/// awake: it is the one that is in a hurry.
constexpr Microseconds SleepSlack = 100;

std::chrono::steady_clock::time_point At(Microseconds time) {
    return std::chrono::steady_clock::time_point(std::chrono::microseconds(time));
}

}  // namespace

EventScheduler::EventId NewEventId() {
    static std::atomic<EventScheduler::EventId> last = 0;
    return ++last;
}

RealScheduler& RealScheduler::Instance() {
    static const auto scheduler = std::make_shared<RealScheduler>();
    return *scheduler;
}

RealScheduler::~RealScheduler() {
    Hold hold(lock);
    decltype(events) dropped;
    dropped.swap(events);
    WaitForEnd(hold);
    hold.unlock();
}

std::uint64_t RealScheduler::Now() {
    return RealClock::Instance().Now();
}

EventScheduler::EventId RealScheduler::CallAt(std::uint64_t time, std::function<void()> event) {
    const EventId id = NewEventId();
    Hold hold(lock);
    JoinEndedThread(hold);
    const auto place = events.emplace(std::pair(time, id), std::move(event)).first;
    if (threadState == ThreadState::None) {
        StartThread();
    }
    if (place == events.begin()) {
        (waiterEntered ? waitersTurn : threadsTurn).notify_one();
    }
    callEnded.notify_all();  // the end of the thread is not to be waited for any more
    const bool isAnEventsOwn = running != 0 && runner == std::this_thread::get_id();
    hold.unlock();
    if (!isAnEventsOwn) {
        WorkOffInWaits(weak_from_this());
    }
    return id;
}

void RealScheduler::Forget(EventId id) {
    std::function<void()> dropped;  // what it holds may be anything: it goes without the lock
    Hold hold(lock);
    const auto found =
        std::ranges::find_if(events, [id](const auto& waiting) { return waiting.first.second == id; });
    if (found != events.end()) {
        dropped = std::move(found->second);
        events.erase(found);
    }
    if (running != 0 && runner == std::this_thread::get_id()) {
        return;  // from inside an event
    }
    callEnded.wait(hold, [this, id] { return running != id; });
    if (events.empty() && running == 0) {
        WaitForEnd(hold);
    }
    hold.unlock();
}

void RealScheduler::StartThread() {
    threadState = ThreadState::Running;
    if (!StartSystemThread(thread, RunThread, this)) {
        // Without a thread the events wait for the next call that can have one: late, but not lost.
        threadState = ThreadState::None;
    }
}

void* RealScheduler::RunThread(void* scheduler) {
    // Events are for their time, not for up to 50 us later.
    constexpr unsigned long ExactTimers = 1;
    prctl(PR_SET_TIMERSLACK, ExactTimers);
    static_cast<RealScheduler*>(scheduler)->CallEvents();
    return nullptr;
}

void RealScheduler::CallEvents() {
    Hold hold(lock);
    while (!events.empty()) {
        const Microseconds now = Now();
        Microseconds time = std::max(events.begin()->first.first, leftToWaiters);
        if (waiterEntered) {
            time = std::max(time, now + Patience);
        }
        if (time > now) {
            // A time so far off that the system's clock could not hold it is approached in steps.
            threadsTurn.wait_until(hold, At(std::min(time, now + LongestStep)));
        } else {
            CallNext(hold);
        }
    }
    threadState = ThreadState::Ended;
    callEnded.notify_all();
}

void RealScheduler::CallNext(Hold& hold) {
    const auto next = events.begin();
    running = next->first.second;
    runner = std::this_thread::get_id();
    std::function<void()> event = std::move(next->second);
    events.erase(next);
    hold.unlock();
    event();
    event = nullptr;
    hold.lock();
    running = 0;
    callEnded.notify_all();
    if (events.empty()) {
        threadsTurn.notify_one();
    }
}

bool RealScheduler::TryEnter() {
    const Hold hold(lock);
    if (waiterEntered || running != 0 || events.empty()) {
        return false;
    }
    waiterEntered = true;
    interrupted = false;
    return true;
}

void RealScheduler::WorkOff(Microseconds deadline) {
    Hold hold(lock);
    while (!interrupted && !events.empty()) {
        const Microseconds now = Now();
        const Microseconds time = events.begin()->first.first;
        if (now >= time) {
            CallNext(hold);
            break;
        }
        if (now >= deadline) {
            break;
        }
        const Microseconds end = std::min({time, deadline, now + LongestStep});
        if (end - now > SleepSlack) {
            waitersTurn.wait_until(hold, At(end - SleepSlack));
        } else {
            hold.unlock();
            sched_yield();
            hold.lock();
        }
    }
    waiterEntered = false;
    leftToWaiters = Now() + Patience;
    hold.unlock();
}

void RealScheduler::Interrupt() {
    const Hold hold(lock);
    interrupted = true;
    waitersTurn.notify_one();
}

void RealScheduler::JoinEndedThread(Hold& hold) {
    if (threadState != ThreadState::Ended) {
        return;
    }
    threadState = ThreadState::None;
    const pthread_t ended = thread;
    hold.unlock();
    pthread_join(ended, nullptr);
    hold.lock();
}

void RealScheduler::WaitForEnd(Hold& hold) {
    threadsTurn.notify_one();
    callEnded.wait(hold, [this] { return threadState != ThreadState::Running || !events.empty(); });
    JoinEndedThread(hold);
}

}  // namespace Varnholt::Platform::Posix
