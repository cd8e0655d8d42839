#pragma once

#include <condition_variable>
#include <mutex>
#include <thread>

#include "Platform/EventScheduler.h"

namespace Varnholt::Platform {

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

    std::uint64_t Now() override { return SteadyMicroseconds(); }
    void CallAt(std::uint64_t time, std::function<void()> event, const void* owner) override;
    void Forget(const void* owner) override;

  private:
    using Hold = std::unique_lock<std::mutex>;
    void CallEvents();
    void CallNext(Hold& hold);
    void JoinEndedThread(Hold& hold);
    void WaitForEnd(Hold& hold);

    const Starter startThread_;
    std::mutex lock_;  // of everything below; nothing else is locked while it is held
    ScheduledEvents events_;
    bool isCalling_ = false;
    const void* ownerOfCall_ = nullptr;
    std::condition_variable callEnded_;  // an event's, or the thread's
    std::condition_variable changed_;    // for the thread
    std::thread thread_;
    bool threadRuns_ = false;
};

}  // namespace Varnholt::Platform
