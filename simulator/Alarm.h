#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <limits>
#include <utility>

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

    void RingNoLaterThan(std::uint64_t microseconds) {
        std::uint64_t due = due_;
        do {
            if (due <= microseconds) {
                return;
            }
        } while (!due_.compare_exchange_weak(due, microseconds));
        try {
            scheduler_.CallAt(
                microseconds, [this] { Ring(); }, this);
        } catch (...) {
            due_ = Never;
            throw;
        }
    }
    /// It does not ring any more once this has returned, unless it is called from inside the ringing.
    void Clear() {
        scheduler_.Forget(this);
        due_ = Never;  // afterwards: a setting that was forgotten must not stand for one that will ring
    }

  private:
    static constexpr std::uint64_t Never = std::numeric_limits<std::uint64_t>::max();

    void Ring() {
        due_ = Never;
        ring_();
    }

    Platform::EventScheduler& scheduler_;
    const std::function<void()> ring_;
    std::atomic<std::uint64_t> due_ = Never;  ///< the alarm is set for then, and perhaps for later times
};

}  // namespace Varnholt::Simulator
