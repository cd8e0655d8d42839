#pragma once

#include <cstdint>
#include <functional>
#include <limits>
#include <mutex>
#include <vector>

#include "Platform/EventScheduler.h"

namespace Varnholt::Simulator {

/// Rings at a point in time. Any thread; holds no lock while the scheduler is called or while it rings, so
/// that a scheduler may let other threads run.
class Alarm final {
  public:
    /// It may ring more often than asked for: whoever is called looks what there is to do.
    Alarm(Platform::EventScheduler& eventScheduler, std::function<void()> whenItRings)
        : scheduler_(eventScheduler), ring_(std::move(whenItRings)) {}
    ~Alarm() { Clear(); }
    Alarm(const Alarm&) = delete;
    Alarm& operator=(const Alarm&) = delete;

    void RingNoLaterThan(std::uint64_t microseconds);
    /// It does not ring any more once this has returned, unless it is called from inside the ringing.
    void Clear();

  private:
    struct Setting {
        std::uint64_t number;
        Platform::EventScheduler::EventId event;  // 0 while the scheduler is being called
    };
    static constexpr std::uint64_t Never = std::numeric_limits<std::uint64_t>::max();

    void Ring(std::uint64_t number);

    Platform::EventScheduler& scheduler_;
    const std::function<void()> ring_;
    std::mutex mutex_;  // guards what follows
    std::vector<Setting> waiting_;
    std::uint64_t due_ = Never;  // of the last setting
    std::uint64_t lastNumber_ = 0;
};

}  // namespace Varnholt::Simulator
