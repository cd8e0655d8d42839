#include "Platform/EventScheduler.h"

#include <chrono>
#include <condition_variable>
#include <map>
#include <mutex>
#include <thread>
#include <utility>

namespace Varnholt::Platform {
namespace {

/// Serves simulated devices only, so it stands on the language's own threads: faults that a test places in
/// the platform's calls must not hit the device as well.
class RealTimeScheduler final : public EventScheduler {
  public:
    ~RealTimeScheduler() override {
        {
            const std::lock_guard held(lock);
            stopping = true;
            waiting.clear();
            changed.notify_all();
        }
        if (thread.joinable()) {
            thread.join();
        }
    }

    std::uint64_t Now() override {
        const auto sinceStart = Clock::now().time_since_epoch();
        return static_cast<std::uint64_t>(
            std::chrono::duration_cast<std::chrono::microseconds>(sinceStart).count());
    }

    EventId CallAt(std::uint64_t time, std::function<void()> event) override {
        const std::lock_guard held(lock);
        const EventId id = ++lastId;
        if (stopping) {
            return id;
        }
        waiting.emplace(std::pair(time, id), std::move(event));
        if (threadRuns) {
            changed.notify_all();
        } else {
            if (thread.joinable()) {
                thread.join();  // it has seen that nothing was waiting, and takes the lock no more
            }
            thread = std::thread([this] { Run(); });
            threadRuns = true;
        }
        return id;
    }

    void Forget(EventId id) override {
        std::unique_lock held(lock);
        std::erase_if(waiting, [id](const auto& entry) { return entry.first.second == id; });
        if (std::this_thread::get_id() != thread.get_id()) {
            changed.wait(held, [this, id] { return inCall != id; });
        }
        changed.notify_all();
    }

  private:
    using Clock = std::chrono::steady_clock;

    void Run() {
        std::unique_lock held(lock);
        while (!waiting.empty()) {
            const auto first = waiting.begin();
            const auto [time, id] = first->first;
            if (time > Now()) {
                changed.wait_for(held, std::chrono::microseconds(time - Now()));
                continue;
            }
            const std::function<void()> event = std::move(first->second);
            waiting.erase(first);
            inCall = id;
            held.unlock();
            event();
            held.lock();
            inCall = 0;
            changed.notify_all();
        }
        threadRuns = false;
    }

    std::mutex lock;  // guards all below
    std::condition_variable changed;
    std::map<std::pair<std::uint64_t, EventId>, std::function<void()>>
        waiting;  // by time, then in order of asking
    EventId lastId = 0;
    EventId inCall = 0;
    bool threadRuns = false;
    bool stopping = false;
    std::thread thread;
};

}  // namespace

EventScheduler& ClockScheduler() {
    static RealTimeScheduler scheduler;
    return scheduler;
}

}  // namespace Varnholt::Platform
