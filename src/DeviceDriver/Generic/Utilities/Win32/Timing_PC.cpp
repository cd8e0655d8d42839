#include "DeviceDriver/Generic/Utilities/Win32/Timing_PC.h"

#include "Platform/Threads.h"
#include "Platform/Time.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {

using Varnholt::Utilities::Tools::SmartPointer;

SmartPointer<Timing> Timing::Instance() try { return SmartPointer<Timing>(new Timing_PC); }
TRACED

void Timing_PC::DeviceDriverSleep(std::uint32_t milliseconds) try {
    Platform::SleepMilliseconds(milliseconds);
}
TRACED

ActualTime Timing_PC::GetActualTime() try {
    const Platform::WallTime now = Platform::WallClockNow();
    const Platform::CalendarTime calendar = Platform::LocalCalendarTime(now.seconds);
    ActualTime time{static_cast<std::uint16_t>(calendar.year),
                    static_cast<std::uint8_t>(calendar.month),
                    static_cast<std::uint8_t>(calendar.day),
                    static_cast<std::uint8_t>(calendar.hour),
                    static_cast<std::uint8_t>(calendar.minute),
                    static_cast<std::uint8_t>(calendar.second),
                    now.milliseconds,
                    0};
    return SetEpochSeconds(static_cast<std::int32_t>(now.seconds), time);
}
TRACED

double Timing_PC::GetDiffTime(const ActualTime& earlier) try {
    const ActualTime now = GetActualTime();
    const double seconds = static_cast<double>(GetEpochSeconds(now)) - GetEpochSeconds(earlier);
    return seconds + (now.milliseconds - earlier.milliseconds) / 1000.0;
}
TRACED

std::uint32_t Timing_PC::GetActualTimeStamp() try {
    return static_cast<std::uint32_t>(Platform::WallClockNow().seconds);
}
TRACED

}  // namespace Varnholt::DeviceDriver::Generic::Utilities
