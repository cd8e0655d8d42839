#include "Alarm.h"

#include <algorithm>

namespace Varnholt::Simulator {

void Alarm::RingNoLaterThan(std::uint64_t microseconds) {
    std::uint64_t number = 0;
    {
        const std::lock_guard lock(mutex_);
        if (due_ <= microseconds) {
            return;
        }
        number = lastNumber_ + 1;
        waiting_.push_back({number, 0});
        lastNumber_ = number;
        due_ = microseconds;
    }
    Platform::EventScheduler::EventId event = 0;
    try {
        event = scheduler_.CallAt(microseconds, [this, number] { Ring(number); });
    } catch (...) {
        const std::lock_guard lock(mutex_);
        std::erase_if(waiting_, [number](const Setting& setting) { return setting.number == number; });
        due_ = number == lastNumber_ ? Never : due_;
        throw;
    }
    const std::lock_guard lock(mutex_);
    const auto setting = std::ranges::find(waiting_, number, &Setting::number);
    if (setting != waiting_.end()) {
        setting->event = event;
    }
}

void Alarm::Ring(std::uint64_t number) {
    {
        const std::lock_guard lock(mutex_);
        due_ = number == lastNumber_ ? Never : due_;
    }
    ring_();
    // Known as waiting until now, so that `Clear` waits for the end of the ringing.
    const std::lock_guard lock(mutex_);
    std::erase_if(waiting_, [number](const Setting& setting) { return setting.number == number; });
}

void Alarm::Clear() {
    std::vector<Setting> dropped;
    {
        const std::lock_guard lock(mutex_);
        dropped.swap(waiting_);
        due_ = Never;
    }
    for (const Setting& setting : dropped) {
        scheduler_.Forget(setting.event);
    }
}

}  // namespace Varnholt::Simulator
