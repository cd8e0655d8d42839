#include "Platform/EventScheduler.h"

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <map>
#include <mutex>
#include <system_error>
#include <thread>
#include <utility>

namespace Varnholt::Platform {
namespace {

/// Serves simulated devices only, so it stands on the language's own threads: faults that a test places in
/// the platform's calls must not hit the device as well.
class RealTimeScheduler final : public EventScheduler {
  public:
    std::uint64_t Now() override {
        const auto sinceStart = Clock::now().time_since_epoch();
        return static_cast<std::uint64_t>(
            std::chrono::duration_cast<std::chrono::microseconds>(sinceStart).count());
    }

    EventId CallAt(std::uint64_t time, std::function<void()> event) override {
        const std::lock_guard held(lock_);
        const EventId id = ++lastId_;
        waiting_.emplace(std::pair(time, id), std::move(event));
        if (threadRuns_) {
            changed_.notify_all();
        } else {
            StartThread();
        }
        return id;
    }

    void Forget(EventId id) override {
        Event dropped;  // what it holds may be anything: it goes without the lock
        std::unique_lock held(lock_);
        const auto found =
            std::ranges::find_if(waiting_, [id](const auto& entry) { return entry.first.second == id; });
        if (found != waiting_.end()) {
            dropped = std::move(found->second);
            waiting_.erase(found);
            changed_.notify_all();
        }
        if (std::this_thread::get_id() != thread_.get_id()) {
            changed_.wait(held, [this, id] { return inCall_ != id; });
        }
        held.unlock();
    }

  private:
    using Clock = std::chrono::steady_clock;
    using Event = std::function<void()>;

    void StartThread() {
        if (thread_.joinable()) {
            thread_.join();  // it has seen that nothing was waiting, and takes the lock no more
        }
        try {
            thread_ = std::thread([this] { Run(); });
            threadRuns_ = true;
        } catch (const std::system_error&) {
            // Without a thread the events wait for the next call that can have one: late, but not lost.
        }
    }

    void Run() {
        std::unique_lock held(lock_);
        while (!waiting_.empty()) {
            const auto first = waiting_.begin();
            const auto [time, id] = first->first;
            if (time > Now()) {
                changed_.wait_for(held, std::chrono::microseconds(time - Now()));
                continue;
            }
            Event event = std::move(first->second);
            waiting_.erase(first);
            inCall_ = id;
            held.unlock();
            event();
            event = nullptr;
            held.lock();
            inCall_ = 0;
            changed_.notify_all();
        }
        threadRuns_ = false;
    }

    std::mutex lock_;  // guards all below; nothing else is called while it is held
    std::condition_variable changed_;
    std::map<std::pair<std::uint64_t, EventId>, Event> waiting_;  // by time, then in order of asking
    EventId lastId_ = 0;
    EventId inCall_ = 0;
    bool threadRuns_ = false;
    std::thread thread_;
};

}  // namespace

EventScheduler& ClockScheduler() {
    // Never destroyed: that would be at the unloading of a library, when no thread can be waited for.
    static auto& scheduler = *new RealTimeScheduler;
    return scheduler;
}

}  // namespace Varnholt::Platform
