#pragma once

#include <utility>

#include "Platform/EventScheduler.h"

namespace Varnholt::Simulator {

/// Follows the clock in force, for instruments that outlive a virtual clock or are there before it.
class SchedulerInForce final : public Platform::EventScheduler {
  public:
    std::uint64_t Now() override { return Platform::ClockScheduler().Now(); }
    EventId CallAt(std::uint64_t time, std::function<void()> event) override {
        return Platform::ClockScheduler().CallAt(time, std::move(event));
    }
    void Forget(EventId id) override { Platform::ClockScheduler().Forget(id); }
};

}  // namespace Varnholt::Simulator
