#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <utility>

#include "Platform/EventScheduler.h"

namespace Varnholt::Simulator {

/// Waits for files and for points in time, and calls whoever asked for them, on the thread of `Run`. To be
/// used from that thread only.
class PollLoop : public Platform::EventScheduler {
  public:
    std::uint64_t Now() override { return Platform::SteadyMicroseconds(); }
    void CallAt(std::uint64_t time, std::function<void()> event, const void* owner = nullptr) override;
    void Forget(const void* owner) override;
    /// As soon as what is being called now has returned.
    void CallSoon(std::function<void()> event, const void* owner) { CallAt(0, std::move(event), owner); }

    /// Calls `handler` whenever the file is ready for one of `events` (as for poll), or broken. Replaces an
    /// earlier watch of the file.
    void Watch(int file, short events, std::function<void()> handler);
    void Unwatch(int file) { watches_.erase(file); }

    /// Until `Stop`.
    void Run();
    void Stop() { stopped_ = true; }

  private:
    struct WatchedFile {
        short events;
        std::shared_ptr<const std::function<void()>> handler;
    };

    void CallDueEvents();
    int MillisecondsToNextEvent();

    std::map<int, WatchedFile> watches_;
    Platform::ScheduledEvents waiting_;
    bool stopped_ = false;
};

}  // namespace Varnholt::Simulator
