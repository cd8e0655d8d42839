#pragma once

#include <condition_variable>
#include <map>
#include <mutex>
#include <thread>
#include <utility>

#include "Platform/EventScheduler.h"

namespace Varnholt::Platform {

/// Names events across all schedulers, so that an event of one is never taken for an event of another.
EventScheduler::EventId NewEventId();

/// Events in real time, called on a thread that exists while events wait. It stands on the language's own
/// threads: faults that a test places in the platform's calls must not hit a simulated device as well.
class RealScheduler final : public EventScheduler {
  public:
    /// Starts a thread that calls `run`; may throw where there can be none.
    using Starter = std::thread (*)(std::function<void()> run);

    explicit RealScheduler(Starter startThread) : startThread_(startThread) {}
    /// Events that still wait are dropped; the thread is seen to its end.
    ~RealScheduler() override;
    RealScheduler(const RealScheduler&) = delete;
    RealScheduler& operator=(const RealScheduler&) = delete;

    std::uint64_t Now() override;
    EventId CallAt(std::uint64_t time, std::function<void()> event) override;
    void Forget(EventId id) override;

  private:
    using Hold = std::unique_lock<std::mutex>;
    void CallEvents();
    void CallNext(Hold& hold);
    void JoinEndedThread(Hold& hold);
    void WaitForEnd(Hold& hold);

    const Starter startThread_;
    std::mutex lock_;  // of everything below; nothing else is locked while it is held
    std::map<std::pair<std::uint64_t, EventId>, std::function<void()>> events_;
    EventId running_ = 0;
    std::thread::id runner_;             // of the event that is running
    std::condition_variable callEnded_;  // an event's, or the thread's
    std::condition_variable changed_;    // for the thread
    std::thread thread_;
    bool threadRuns_ = false;
};

}  // namespace Varnholt::Platform
