#pragma once

#include <functional>
#include <utility>

#include "Platform/EventScheduler.h"

namespace Varnholt::Simulator {

/// Time that stands still until a test moves it. One thread.
class ManualScheduler : public Platform::EventScheduler {
  public:
    std::uint64_t Now() override { return now_; }
    void CallAt(std::uint64_t time, std::function<void()> event, const void* owner = nullptr) override {
        waiting_.emplace(time, Platform::ScheduledEvent{std::move(event), owner});
    }
    void Forget(const void* owner) override {
        std::erase_if(waiting_, [owner](const auto& entry) { return entry.second.owner == owner; });
    }

    void Advance(std::uint64_t microseconds) {
        const std::uint64_t end = now_ + microseconds;
        while (!waiting_.empty() && waiting_.begin()->first <= end) {
            now_ = std::max(now_, waiting_.begin()->first);
            waiting_.extract(waiting_.begin()).mapped().call();
        }
        now_ = end;
    }
    std::size_t Waiting() const { return waiting_.size(); }

  private:
    std::uint64_t now_ = 1'000'000;
    Platform::ScheduledEvents waiting_;
};

}  // namespace Varnholt::Simulator
