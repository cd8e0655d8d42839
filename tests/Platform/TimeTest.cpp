#include <gtest/gtest.h>

#include <chrono>
#include <ctime>

#include "EachClock.h"
#include "Platform/EventScheduler.h"
#include "Platform/Threads.h"
#include "Platform/Time.h"

namespace Varnholt::Platform {
namespace {

using Clocks = EachClock;
INSTANTIATE_FOR_EACH_CLOCK(Clocks);

TEST_P(Clocks, AgreeOnASleep) {
    const std::uint64_t counter = PerformanceCounter();
    const std::uint32_t ticks = TickCount();
    const WallTime wall = WallClockNow();
    const std::uint64_t scheduler = ClockScheduler().Now();
    SleepMilliseconds(200);
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

TEST(Calendar, IsLocalTime) {
    for (const std::int64_t seconds : {std::int64_t{0x7FFFFFFF}, std::int64_t{1'000'000'000},
                                       std::int64_t{951'782'400}, std::int64_t{1'709'210'096}}) {
        const auto time = static_cast<std::time_t>(seconds);
        const std::tm* const expected = std::localtime(&time);
        const CalendarTime actual = LocalCalendarTime(seconds);
        EXPECT_EQ(actual.year, expected->tm_year + 1900);
        EXPECT_EQ(actual.month, expected->tm_mon + 1);
        EXPECT_EQ(actual.day, expected->tm_mday);
        EXPECT_EQ(actual.hour, expected->tm_hour);
        EXPECT_EQ(actual.minute, expected->tm_min);
        EXPECT_EQ(actual.second, expected->tm_sec);
    }
}

TEST(WallClock, IsTheSystems) {
    const auto expected = std::chrono::system_clock::to_time_t(std::chrono::system_clock::now());
    EXPECT_NEAR(static_cast<double>(WallClockNow().seconds), static_cast<double>(expected), 2);
}

}  // namespace
}  // namespace Varnholt::Platform
