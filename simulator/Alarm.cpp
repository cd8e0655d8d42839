#include "Alarm.h"

#include <algorithm>

namespace Varnholt::Simulator {

void Alarm::RingNoLaterThan(std::uint64_t microseconds) {
    std::uint64_t number = 0;
    {
        const std::lock_guard lock(mutex);
        if (due <= microseconds) {
            return;
        }
        number = lastNumber + 1;
        waiting.push_back({number, 0});
        lastNumber = number;
        due = microseconds;
    }
    Platform::EventScheduler::EventId event = 0;
    try {
        event = scheduler.CallAt(microseconds, [this, number] { Ring(number); });
    } catch (...) {
        const std::lock_guard lock(mutex);
        std::erase_if(waiting, [number](const Setting& setting) { return setting.number == number; });
        due = number == lastNumber ? Never : due;
        throw;
    }
    const std::lock_guard lock(mutex);
    const auto setting = std::ranges::find(waiting, number, &Setting::number);
    if (setting != waiting.end()) {
        setting->event = event;
    }
}

void Alarm::Ring(std::uint64_t number) {
    {
        const std::lock_guard lock(mutex);
        due = number == lastNumber ? Never : due;
    }
    ring();
    // Known as waiting until now, so that `Clear` waits for the end of the ringing.
    const std::lock_guard lock(mutex);
    std::erase_if(waiting, [number](const Setting& setting) { return setting.number == number; });
}

void Alarm::Clear() {
    std::vector<Setting> dropped;
    {
        const std::lock_guard lock(mutex);
        dropped.swap(waiting);
        due = Never;
    }
    for (const Setting& setting : dropped) {
        scheduler.Forget(setting.event);
    }
}

}  // namespace Varnholt::Simulator
