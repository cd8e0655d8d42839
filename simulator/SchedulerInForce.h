#pragma once

#include <utility>

#include "Platform/EventScheduler.h"

namespace Varnholt::Simulator {

/// Follows the clock in force, for instruments that outlive a virtual clock or are there before it.
class SchedulerInForce final : public Platform::EventScheduler {
  public:
    std::uint64_t Now() override { return Platform::ClockScheduler().Now(); }
    void CallAt(std::uint64_t time, std::function<void()> event, const void* owner) override {
        Platform::ClockScheduler().CallAt(time, std::move(event), owner);
    }
    void Forget(const void* owner) override { Platform::ClockScheduler().Forget(owner); }
};

}  // namespace Varnholt::Simulator
