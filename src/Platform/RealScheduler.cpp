#include "Platform/RealScheduler.h"

#include <algorithm>
#include <chrono>
#include <exception>

namespace Varnholt::Platform {

using std::chrono::microseconds;
using std::chrono::steady_clock;

namespace {

constexpr std::uint64_t LongestStep = 3'600'000'000;

}  // namespace

void TakeEventsOf(const void* owner, ScheduledEvents& events, ScheduledEvents& taken) {
    for (auto next = events.begin(); next != events.end();) {
        const auto event = next++;
        if (event->second.owner == owner) {
            taken.insert(events.extract(event));
        }
    }
}

RealScheduler::~RealScheduler() {
    ScheduledEvents dropped;  // ends without the lock
    Hold hold(lock_);
    dropped.swap(events_);
    WaitForEnd(hold);
}

std::uint64_t SteadyMicroseconds() {
    const auto sinceStart = steady_clock::now().time_since_epoch();
    return static_cast<std::uint64_t>(std::chrono::floor<microseconds>(sinceStart).count());
}

void RealScheduler::CallAt(std::uint64_t time, std::function<void()> event, const void* owner) {
    Hold hold(lock_);
    JoinEndedThread(hold);
    const auto place = events_.emplace(time, ScheduledEvent{std::move(event), owner});
    if (!thread_.joinable()) {
        try {
            thread_ = startThread_([this] { CallEvents(); });
            threadRuns_ = true;
        } catch (const std::exception&) {
            // Without a thread the events wait for the next call that can have one: late, but not lost.
        }
    }
    if (place == events_.begin()) {
        changed_.notify_one();
    }
    callEnded_.notify_all();  // the end of the thread is not to be waited for any more
}

void RealScheduler::Forget(const void* owner) {
    ScheduledEvents dropped;
    Hold hold(lock_);
    TakeEventsOf(owner, events_, dropped);
    if (isCalling_ && thread_.get_id() == std::this_thread::get_id()) {
        return;  // from inside an event
    }
    while (isCalling_ && ownerOfCall_ == owner) {
        callEnded_.wait(hold);
        TakeEventsOf(owner, events_, dropped);
    }
    if (events_.empty() && !isCalling_) {
        WaitForEnd(hold);
    }
}

void RealScheduler::CallEvents() {
    Hold hold(lock_);
    while (!events_.empty()) {
        const std::uint64_t now = SteadyMicroseconds();
        const std::uint64_t time = events_.begin()->first;
        if (time > now) {
            // A time so far off that the system's clock could not hold it is approached in steps.
            changed_.wait_until(hold,
                                steady_clock::time_point(microseconds(std::min(time, now + LongestStep))));
        } else {
            CallNext(hold);
        }
    }
    threadRuns_ = false;
    callEnded_.notify_all();
}

void RealScheduler::CallNext(Hold& hold) {
    ScheduledEvent event = std::move(events_.extract(events_.begin()).mapped());
    isCalling_ = true;
    ownerOfCall_ = event.owner;
    hold.unlock();
    event.call();
    event.call = nullptr;
    hold.lock();
    isCalling_ = false;
    callEnded_.notify_all();
}

void RealScheduler::JoinEndedThread(Hold& hold) {
    if (threadRuns_ || !thread_.joinable()) {
        return;
    }
    std::thread ended = std::move(thread_);
    hold.unlock();
    ended.join();
    hold.lock();
}

void RealScheduler::WaitForEnd(Hold& hold) {
    changed_.notify_one();
    callEnded_.wait(hold, [this] { return !threadRuns_ || !events_.empty(); });
    JoinEndedThread(hold);
}

}  // namespace Varnholt::Platform
