#pragma once

#include <functional>
#include <map>
#include <utility>

#include "Platform/EventScheduler.h"

namespace Varnholt::Simulator {

/// Time that stands still until a test moves it. One thread.
class ManualScheduler : public Platform::EventScheduler {
  public:
    std::uint64_t Now() override { return now; }
    EventId CallAt(std::uint64_t time, std::function<void()> event) override {
        waiting.emplace(std::pair(time, ++lastId), std::move(event));
        return lastId;
    }
    void Forget(EventId id) override {
        std::erase_if(waiting, [id](const auto& entry) { return entry.first.second == id; });
    }

    void Advance(std::uint64_t microseconds) {
        const std::uint64_t end = now + microseconds;
        while (!waiting.empty() && waiting.begin()->first.first <= end) {
            const auto first = waiting.begin();
            now = std::max(now, first->first.first);
            const std::function<void()> event = std::move(first->second);
            waiting.erase(first);
            event();
        }
        now = end;
    }
    std::size_t Waiting() const { return waiting.size(); }

  private:
    std::uint64_t now = 1'000'000;
    EventId lastId = 0;
    std::map<std::pair<std::uint64_t, EventId>, std::function<void()>> waiting;
};

}  // namespace Varnholt::Simulator
