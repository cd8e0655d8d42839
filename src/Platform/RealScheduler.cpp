#include "Platform/RealScheduler.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <exception>

namespace Varnholt::Platform {

using std::chrono::microseconds;
using std::chrono::steady_clock;

namespace {

constexpr std::uint64_t LongestStep = 3'600'000'000;

}  // namespace

EventScheduler::EventId NewEventId() {
    static std::atomic<EventScheduler::EventId> last = 0;
    return ++last;
}

RealScheduler::~RealScheduler() {
    decltype(events_) dropped;  // goes without the lock
    Hold hold(lock_);
    dropped.swap(events_);
    WaitForEnd(hold);
}

std::uint64_t RealScheduler::Now() {
    const auto sinceStart = steady_clock::now().time_since_epoch();
    return static_cast<std::uint64_t>(std::chrono::floor<microseconds>(sinceStart).count());
}

EventScheduler::EventId RealScheduler::CallAt(std::uint64_t time, std::function<void()> event) {
    const EventId id = NewEventId();
    Hold hold(lock_);
    JoinEndedThread(hold);
    const auto place = events_.emplace(std::pair(time, id), std::move(event)).first;
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
}

void RealScheduler::CallEvents() {
    Hold hold(lock_);
    while (!events_.empty()) {
        const std::uint64_t now = Now();
        const std::uint64_t time = events_.begin()->first.first;
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
