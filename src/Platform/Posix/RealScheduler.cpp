#include "Platform/Posix/RealScheduler.h"

#include <sys/prctl.h>

#include <algorithm>
#include <atomic>
#include <chrono>

#include "Platform/Posix/RealClock.h"
#include "Platform/Posix/SystemThread.h"

namespace Varnholt::Platform::Posix {
namespace {

constexpr Microseconds LongestStep = 3'600'000'000;

}  // namespace

EventScheduler::EventId NewEventId() {
    static std::atomic<EventScheduler::EventId> last = 0;
    return ++last;
}

RealScheduler& RealScheduler::Instance() {
    static RealScheduler scheduler;
    return scheduler;
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
    } else if (place == events.begin()) {
        changed.notify_all();
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
    if (threadState == ThreadState::Running && pthread_equal(thread, pthread_self())) {
        return;  // from inside an event
    }
    changed.wait(hold, [this, id] { return running != id; });
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
        const auto next = events.begin();
        const Microseconds time = next->first.first;
        if (time > Now()) {
            // A time so far off that the system's clock could not hold it is approached in steps.
            const Microseconds step = std::min(time, Now() + LongestStep);
            const std::chrono::steady_clock::time_point then{std::chrono::microseconds(step)};
            changed.wait_until(hold, then);
            continue;
        }
        running = next->first.second;
        std::function<void()> event = std::move(next->second);
        events.erase(next);
        hold.unlock();
        event();
        event = nullptr;
        hold.lock();
        running = 0;
        changed.notify_all();
    }
    threadState = ThreadState::Ended;
    changed.notify_all();
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
    changed.notify_all();
    changed.wait(hold, [this] { return threadState != ThreadState::Running || !events.empty(); });
    JoinEndedThread(hold);
}

}  // namespace Varnholt::Platform::Posix
