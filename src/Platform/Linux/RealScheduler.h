#pragma once

#include <pthread.h>

#include <condition_variable>
#include <map>
#include <mutex>
#include <thread>
#include <utility>

#include "Platform/EventScheduler.h"
#include "Platform/Linux/Clock.h"

namespace Varnholt::Platform::Linux {

/// Names events across all schedulers, so that an event of one is never taken for an event of another.
EventScheduler::EventId NewEventId();

/// Events in real time, called on a thread that exists while events wait.
class RealScheduler final : public EventScheduler {
  public:
    static RealScheduler& Instance();

    RealScheduler() = default;
    /// Events that still wait are dropped; the thread is seen to its end.
    ~RealScheduler() override;
    RealScheduler(const RealScheduler&) = delete;
    RealScheduler& operator=(const RealScheduler&) = delete;

    std::uint64_t Now() override;
    EventId CallAt(std::uint64_t time, std::function<void()> event) override;
    void Forget(EventId id) override;

  private:
    using Hold = std::unique_lock<std::mutex>;
    static void* RunThread(void* scheduler);
    void CallEvents();
    void CallNext(Hold& hold);
    void StartThread();
    void JoinEndedThread(Hold& hold);
    void WaitForEnd(Hold& hold);

    std::mutex lock_;  // of everything below; nothing else is locked while it is held
    std::map<std::pair<Microseconds, EventId>, std::function<void()>> events_;
    EventId running_ = 0;
    std::thread::id runner_;             // of the event that is running
    std::condition_variable callEnded_;  // an event's, or the thread's
    std::condition_variable changed_;    // for the thread
    enum class ThreadState { None, Running, Ended } threadState_ = ThreadState::None;
    pthread_t thread_{};
};

}  // namespace Varnholt::Platform::Linux
