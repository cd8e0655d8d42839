#include "Platform/Time.h"

#include <ctime>

#include "Platform/Linux/Clock.h"

namespace Varnholt::Platform {
namespace {

constexpr std::uint64_t CountsPerSecond = 1'000'000;

}  // namespace

std::uint64_t PerformanceFrequency() {
    return CountsPerSecond;
}

std::uint64_t PerformanceCounter() {
    return Linux::CurrentClock().Now();
}

std::uint32_t TickCount() {
    return static_cast<std::uint32_t>(Linux::CurrentClock().Now() / 1000);
}

WallTime WallClockNow() {
    return Linux::CurrentClock().Wall();
}

CalendarTime LocalCalendarTime(std::int64_t seconds) {
    const auto time = static_cast<std::time_t>(seconds);
    std::tm local{};
    if (!localtime_r(&time, &local)) {
        return {1970, 1, 1, 0, 0, 0};  // a year that no calendar field can hold
    }
    return {local.tm_year + 1900, local.tm_mon + 1, local.tm_mday, local.tm_hour, local.tm_min, local.tm_sec};
}

void SoundSystemBeep(std::uint32_t /*hertz*/, std::uint32_t /*milliseconds*/) {}

}  // namespace Varnholt::Platform
