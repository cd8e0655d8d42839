#pragma once

#include <cstdint>
#include <functional>

namespace Varnholt::Platform {

/// Counts per second of the high-resolution counter; 0 where there is none.
std::uint64_t PerformanceFrequency();
std::uint64_t PerformanceCounter();

/// Milliseconds since the system started; wraps.
std::uint32_t TickCount();

struct WallTime {
    std::int64_t seconds;  ///< since 1970-01-01 00:00:00 UTC
    std::uint16_t milliseconds;
};
WallTime WallClockNow();

struct CalendarTime {
    int year, month, day, hour, minute, second;  ///< full year, month 1 to 12, day 1 to 31
};
CalendarTime LocalCalendarTime(std::int64_t seconds);

/// Sounds the platform's beep, where there is one; waits for its end only where the platform does.
void Beep(std::uint32_t hertz, std::uint32_t milliseconds);
/// The same, whether tests listen or not.
void SoundSystemBeep(std::uint32_t hertz, std::uint32_t milliseconds);

/// Tests listen to the beeps instead of sounding them; an empty function gives the beep back to the system.
/// The function is called on the beeping thread.
using BeepObserver = std::function<void(std::uint32_t hertz, std::uint32_t milliseconds)>;
void ObserveBeeps(BeepObserver observer);

}  // namespace Varnholt::Platform
