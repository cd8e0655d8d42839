#include <array>
#include <chrono>
#include <ctime>
#include <limits>

#include "EachClock.h"
#include "Platform/Threads.h"
#include "Platform/Time.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform {
namespace {

using Clocks = EachClock;
INSTANTIATE_FOR_EACH_CLOCK(Clocks);

TEST_P(Clocks, AgreeOnASleepAndOnWaitsInVain) {
    const std::uint64_t counter = PerformanceCounter();
    const std::uint32_t ticks = TickCount();
    const WallTime wall = WallClockNow();
    const std::uint64_t scheduler = ClockScheduler().Now();
    const OwnedHandle event(MakeAutoResetEvent());
    SleepMilliseconds(80);
    EXPECT_EQ(Wait(event.Get(), 60), WaitResult::TimedOut);
    EXPECT_EQ(WaitAny(std::array{event.Get()}, 60).result, WaitResult::TimedOut);
    const WallTime wallAfter = WallClockNow();
    const auto counted = static_cast<double>(PerformanceCounter() - counter);
    const double byCounter = counted * 1000 / static_cast<double>(PerformanceFrequency());
    const auto byWall = static_cast<double>((wallAfter.seconds - wall.seconds) * 1000 +
                                            wallAfter.milliseconds - wall.milliseconds);
    const auto byScheduler = static_cast<double>(ClockScheduler().Now() - scheduler) / 1000;
    for (const double milliseconds :
         {byCounter, static_cast<double>(TickCount() - ticks), byWall, byScheduler}) {
        EXPECT_GE(milliseconds, 180);  // a tick may be 16 ms long
        EXPECT_LT(milliseconds, 5000);
    }
    EXPECT_LT(wallAfter.milliseconds, 1000);
}

TEST(WallClock, AndItsCalendarAreTheSystems) {
    const auto now = std::chrono::system_clock::to_time_t(std::chrono::system_clock::now());
    EXPECT_NEAR(static_cast<double>(WallClockNow().seconds), static_cast<double>(now), 2);
    for (const std::time_t seconds : {std::time_t{0x7FFFFFFF}, std::time_t{951'782'400}, now}) {
        const std::tm* const expected = std::localtime(&seconds);
        const CalendarTime actual = LocalCalendarTime(seconds);
        EXPECT_EQ(
            (std::array{actual.year, actual.month, actual.day, actual.hour, actual.minute, actual.second}),
            (std::array{expected->tm_year + 1900, expected->tm_mon + 1, expected->tm_mday, expected->tm_hour,
                        expected->tm_min, expected->tm_sec}));
    }
#if !defined(_WIN32)
    const CalendarTime beyond = LocalCalendarTime(std::numeric_limits<std::int64_t>::max());
    EXPECT_EQ((std::array{beyond.year, beyond.month, beyond.day, beyond.hour, beyond.minute, beyond.second}),
              (std::array{1970, 1, 1, 0, 0, 0}));
#endif
}

}  // namespace
}  // namespace Varnholt::Platform
