#pragma once

#include <functional>
#include <map>
#include <utility>

#include "Platform/EventScheduler.h"

namespace Varnholt::Simulator {

/// Time that stands still until a test moves it. One thread.
class ManualScheduler : public Platform::EventScheduler {
  public:
    std::uint64_t Now() override { return now_; }
    EventId CallAt(std::uint64_t time, std::function<void()> event) override {
        waiting_.emplace(std::pair(time, ++lastId_), std::move(event));
        return lastId_;
    }
    void Forget(EventId id) override {
        std::erase_if(waiting_, [id](const auto& entry) { return entry.first.second == id; });
    }

    void Advance(std::uint64_t microseconds) {
        const std::uint64_t end = now_ + microseconds;
        while (!waiting_.empty() && waiting_.begin()->first.first <= end) {
            const auto first = waiting_.begin();
            now_ = std::max(now_, first->first.first);
            const std::function<void()> event = std::move(first->second);
            waiting_.erase(first);
            event();
        }
        now_ = end;
    }
    std::size_t Waiting() const { return waiting_.size(); }

  private:
    std::uint64_t now_ = 1'000'000;
    EventId lastId_ = 0;
    std::map<std::pair<std::uint64_t, EventId>, std::function<void()>> waiting_;
};

}  // namespace Varnholt::Simulator
