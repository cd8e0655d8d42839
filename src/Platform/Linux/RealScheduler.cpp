#include "Platform/Linux/RealScheduler.h"

#include <sys/prctl.h>

#include <algorithm>
#include <atomic>
#include <chrono>

#include "Platform/Linux/RealClock.h"
#include "Platform/Linux/SystemThread.h"

namespace Varnholt::Platform::Linux {
namespace {

constexpr Microseconds LongestStep = 3'600'000'000;

std::chrono::steady_clock::time_point At(Microseconds time) {
    return std::chrono::steady_clock::time_point(std::chrono::microseconds(time));
}

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
    Hold hold(lock_);
    decltype(events_) dropped;
    dropped.swap(events_);
    WaitForEnd(hold);
    hold.unlock();
}

std::uint64_t RealScheduler::Now() {
    return RealClock::Instance().Now();
}

EventScheduler::EventId RealScheduler::CallAt(std::uint64_t time, std::function<void()> event) {
    const EventId id = NewEventId();
    Hold hold(lock_);
    JoinEndedThread(hold);
    const auto place = events_.emplace(std::pair(time, id), std::move(event)).first;
    if (threadState_ == ThreadState::None) {
        StartThread();
    }
    if (place == events_.begin()) {
        changed_.notify_one();
    }
    callEnded_.notify_all();  // the end of the thread is not to be waited for any more
    return id;
}

void RealScheduler::Forget(EventId id) {
    std::function<void()> dropped;  // what it holds may be anything: it goes without the lock
    Hold hold(lock_);
    const auto found =
        std::ranges::find_if(events_, [id](const auto& waiting) { return waiting.first.second == id; });
    if (found != events_.end()) {
        dropped = std::move(found->second);
        events_.erase(found);
    }
    if (running_ != 0 && runner_ == std::this_thread::get_id()) {
        return;  // from inside an event
    }
    callEnded_.wait(hold, [this, id] { return running_ != id; });
    if (events_.empty() && running_ == 0) {
        WaitForEnd(hold);
    }
    hold.unlock();
}

void RealScheduler::StartThread() {
    threadState_ = ThreadState::Running;
    if (!StartSystemThread(thread_, RunThread, this)) {
        // Without a thread the events wait for the next call that can have one: late, but not lost.
        threadState_ = ThreadState::None;
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
    Hold hold(lock_);
    while (!events_.empty()) {
        const Microseconds now = Now();
        const Microseconds time = events_.begin()->first.first;
        if (time > now) {
            // A time so far off that the system's clock could not hold it is approached in steps.
            changed_.wait_until(hold, At(std::min(time, now + LongestStep)));
        } else {
            CallNext(hold);
        }
    }
    threadState_ = ThreadState::Ended;
    callEnded_.notify_all();
}

void RealScheduler::CallNext(Hold& hold) {
    const auto next = events_.begin();
    running_ = next->first.second;
    runner_ = std::this_thread::get_id();
    std::function<void()> event = std::move(next->second);
    events_.erase(next);
    hold.unlock();
    event();
    event = nullptr;
    hold.lock();
    running_ = 0;
    callEnded_.notify_all();
}

void RealScheduler::JoinEndedThread(Hold& hold) {
    if (threadState_ != ThreadState::Ended) {
        return;
    }
    threadState_ = ThreadState::None;
    const pthread_t ended = thread_;
    hold.unlock();
    pthread_join(ended, nullptr);
    hold.lock();
}

void RealScheduler::WaitForEnd(Hold& hold) {
    changed_.notify_one();
    callEnded_.wait(hold, [this] { return threadState_ != ThreadState::Running || !events_.empty(); });
    JoinEndedThread(hold);
}

}  // namespace Varnholt::Platform::Linux
