#include "Platform/Time.h"

#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

/// File times count units of 100 ns from 1601-01-01 00:00:00 UTC.
constexpr std::int64_t UnitsPerMillisecond = 10'000;
constexpr std::int64_t UnitsPerSecond = 1000 * UnitsPerMillisecond;
constexpr std::int64_t SecondsFrom1601To1970 = 11'644'473'600;

}  // namespace

std::uint64_t PerformanceFrequency() {
    LARGE_INTEGER frequency{};
    return ::QueryPerformanceFrequency(&frequency) ? static_cast<std::uint64_t>(frequency.QuadPart) : 0;
}

std::uint64_t PerformanceCounter() {
    LARGE_INTEGER counter{};
    ::QueryPerformanceCounter(&counter);
    return static_cast<std::uint64_t>(counter.QuadPart);
}

std::uint32_t TickCount() {
    return ::GetTickCount();
}

WallTime WallClockNow() {
    FILETIME now{};
    ::GetSystemTimeAsFileTime(&now);
    const auto units = static_cast<std::int64_t>(std::uint64_t{now.dwHighDateTime} << 32 | now.dwLowDateTime);
    return {units / UnitsPerSecond - SecondsFrom1601To1970,
            static_cast<std::uint16_t>(units % UnitsPerSecond / UnitsPerMillisecond)};
}

CalendarTime LocalCalendarTime(std::int64_t seconds) {
    const auto units = static_cast<std::uint64_t>((seconds + SecondsFrom1601To1970) * UnitsPerSecond);
    const FILETIME fileTime{static_cast<DWORD>(units), static_cast<DWORD>(units >> 32)};
    SYSTEMTIME universal{};
    SYSTEMTIME local{};
    ::FileTimeToSystemTime(&fileTime, &universal);
    if (!::SystemTimeToTzSpecificLocalTime(nullptr, &universal, &local)) {
        local = universal;
    }
    return {local.wYear, local.wMonth, local.wDay, local.wHour, local.wMinute, local.wSecond};
}

void SoundSystemBeep(std::uint32_t hertz, std::uint32_t milliseconds) {
    ::Beep(hertz, milliseconds);
}

}  // namespace Varnholt::Platform
