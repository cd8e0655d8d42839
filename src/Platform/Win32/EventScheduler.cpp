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
        const std::lock_guard held(lock);
        const EventId id = ++lastId;
        waiting.emplace(std::pair(time, id), std::move(event));
        if (threadRuns) {
            changed.notify_all();
        } else {
            StartThread();
        }
        return id;
    }

    void Forget(EventId id) override {
        Event dropped;  // what it holds may be anything: it goes without the lock
        std::unique_lock held(lock);
        const auto found =
            std::ranges::find_if(waiting, [id](const auto& entry) { return entry.first.second == id; });
        if (found != waiting.end()) {
            dropped = std::move(found->second);
            waiting.erase(found);
            changed.notify_all();
        }
        if (std::this_thread::get_id() != thread.get_id()) {
            changed.wait(held, [this, id] { return inCall != id; });
        }
        held.unlock();
    }

  private:
    using Clock = std::chrono::steady_clock;
    using Event = std::function<void()>;

    void StartThread() {
        if (thread.joinable()) {
            thread.join();  // it has seen that nothing was waiting, and takes the lock no more
        }
        try {
            thread = std::thread([this] { Run(); });
            threadRuns = true;
        } catch (const std::system_error&) {
            // Without a thread the events wait for the next call that can have one: late, but not lost.
        }
    }

    void Run() {
        std::unique_lock held(lock);
        while (!waiting.empty()) {
            const auto first = waiting.begin();
            const auto [time, id] = first->first;
            if (time > Now()) {
                changed.wait_for(held, std::chrono::microseconds(time - Now()));
                continue;
            }
            Event event = std::move(first->second);
            waiting.erase(first);
            inCall = id;
            held.unlock();
            event();
            event = nullptr;
            held.lock();
            inCall = 0;
            changed.notify_all();
        }
        threadRuns = false;
    }

    std::mutex lock;  // guards all below; nothing else is called while it is held
    std::condition_variable changed;
    std::map<std::pair<std::uint64_t, EventId>, Event> waiting;  // by time, then in order of asking
    EventId lastId = 0;
    EventId inCall = 0;
    bool threadRuns = false;
    std::thread thread;
};

}  // namespace

EventScheduler& ClockScheduler() {
    // Never destroyed: that would be at the unloading of a library, when no thread can be waited for.
    static auto& scheduler = *new RealTimeScheduler;
    return scheduler;
}

}  // namespace Varnholt::Platform
