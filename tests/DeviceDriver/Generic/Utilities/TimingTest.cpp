#include <gtest/gtest.h>

#include "DeviceDriver/Generic/Utilities/PrecisionTime.h"
#include "DeviceDriver/Generic/Utilities/Win32/Timing_PC.h"
#include "Platform/Time.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {
namespace {

TEST(Timing, CountsSecondsFromThePastIntoTheFuture) {
    const auto timing = Timing::Instance();
    ActualTime time = timing->GetActualTime();
    EXPECT_NEAR(time.seconds, static_cast<double>(Platform::WallClockNow().seconds), 2);
    EXPECT_NEAR(timing->GetActualTimeStamp(), static_cast<double>(time.seconds), 2);
    time.milliseconds = static_cast<std::uint16_t>(time.milliseconds + 500);
    time.seconds -= 1;
    EXPECT_NEAR(timing->GetDiffTime(time), 0.5, 0.4);
    timing->SetEpochSeconds(-2'000'000'000, time);
    EXPECT_GT(timing->GetDiffTime(time), 3e9) << "beyond 32 bits";
}

TEST(PrecisionTime, CarriesAndBorrowsOnceAndCompares) {
    EXPECT_EQ(PrecisionTime(1, 400000) + PrecisionTime(2, 600000), PrecisionTime(4, 0));
    EXPECT_EQ(PrecisionTime(1, 400000) + PrecisionTime(2, 599999), PrecisionTime(3, 999999));
    EXPECT_EQ(PrecisionTime(3, 200000) - PrecisionTime(1, 200000), PrecisionTime(2, 0));
    EXPECT_EQ(PrecisionTime(1, 0) - PrecisionTime(2, 1), PrecisionTime(-2, 999999));
    PrecisionTime assigned;
    assigned = PrecisionTime(2, 5);
    EXPECT_EQ(assigned, PrecisionTime(2, 5));
    EXPECT_EQ(PrecisionTime(2, 123456).GetMilliseconds(), 123);
    EXPECT_EQ(PrecisionTime(2, 123456).GetMicroseconds(), 456);
    EXPECT_TRUE(PrecisionTime(5, 999999) < PrecisionTime(6, 0) && PrecisionTime(-1, 0) < PrecisionTime(0, 0));
}

TEST(PrecisionTime, ComesFromTheCounterOrWithoutOneFromTicks) {
    const std::vector<std::tuple<const char*, std::uint64_t, std::uint64_t, std::uint32_t, PrecisionTime>>
        cases{
            {"nanoseconds", 1000000000, 1234567891, 0, {1, 234567}},
            {"truncated, not rounded", 3000000, 2, 0, {0, 0}},
            {"last before it starts again", 1000000, 4294967295, 0, {4294, 967295}},
            {"starts again", 1000000, 4294967296, 0, {0, 0}},
            {"started again many times", 10000000, 3000000000000ULL, 0, {3647, 256576}},
            {"milliseconds without a counter", 0, 99, 1999999, {1999, 999000}},
            {"ticks are signed", 0, 0, 0xFFFFFC17, {-1, -1000}},
        };
    for (const auto& [name, frequency, counter, ticks, expected] : cases) {
        PrecisionTime time;
        time.SetFromReadings(frequency, counter, ticks);
        EXPECT_EQ(time, expected) << name << ": " << time.GetSeconds() << " s";
    }
    // Ticks are whole milliseconds, the counter's readings are not.
    PrecisionTime now;
    for (int i = 0; i < 100'000 && now.GetMicroseconds() == 0; ++i) {
        now.SetToNow();
    }
    EXPECT_NE(now.GetMicroseconds(), 0);
    const PrecisionTime earlier = now - PrecisionTime(100, 0);
    std::int32_t seconds = 0, milliseconds = 0, microseconds = 0;
    earlier.GetElapsed(seconds, milliseconds, microseconds);
    EXPECT_EQ(seconds, 100);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Generic::Utilities
