#include <gtest/gtest.h>

#include <vector>

#include "DeviceDriver/Generic/Utilities/PrecisionTime.h"
#include "DeviceDriver/Generic/Utilities/Timing.h"
#include "DeviceDriver/Generic/Utilities/Win32/Timing_PC.h"
#include "Platform/Time.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {
namespace {

ActualTime At(std::int32_t seconds, std::uint16_t milliseconds) {
    ActualTime time{};
    time.seconds = seconds;
    time.milliseconds = milliseconds;
    return time;
}

class TimingAt final : public Timing_PC {
  public:
    using Timing_PC::operator=;
    explicit TimingAt(const ActualTime& fixed) : now_(fixed) {}
    ActualTime GetActualTime() override { return now_; }

  private:
    const ActualTime now_;
};

TEST(Timing, DifferenceInSeconds) {
    EXPECT_NEAR(TimingAt(At(101, 250)).GetDiffTime(At(100, 500)), 0.75, 1e-9);
    EXPECT_NEAR(TimingAt(At(10, 950)).GetDiffTime(At(12, 50)), -1.1, 1e-9);
    EXPECT_NEAR(TimingAt(At(2000000000, 0)).GetDiffTime(At(-2000000000, 0)), 4e9, 1e-3) << "beyond 32 bits";
}

TEST(Timing, SleepLastsAndIsSeenByTheClock) {
    const auto timing = Timing::Instance();
    PrecisionTime start;
    start.SetToNow();
    const ActualTime earlier = timing->GetActualTime();
    EXPECT_NEAR(earlier.seconds, static_cast<double>(Platform::WallClockNow().seconds), 1);
    timing->DeviceDriverSleep(30);
    std::int32_t seconds = 0, milliseconds = 0, microseconds = 0;
    start.GetElapsed(seconds, milliseconds, microseconds);
    EXPECT_GE(seconds * 1000 + milliseconds, 29);
    EXPECT_LT(seconds, 20);
    EXPECT_GE(timing->GetDiffTime(earlier), 0.025);
}

TEST(PrecisionTime, CarriesAndBorrowsOnceAndCompares) {
    EXPECT_EQ(PrecisionTime(1, 600000) + PrecisionTime(2, 500000), PrecisionTime(4, 100000));
    EXPECT_EQ(PrecisionTime(1, 400000) + PrecisionTime(2, 600000), PrecisionTime(4, 0));
    EXPECT_EQ(PrecisionTime(1, 400000) + PrecisionTime(2, 599999), PrecisionTime(3, 999999));
    EXPECT_EQ(PrecisionTime(3, 100000) - PrecisionTime(1, 200000), PrecisionTime(1, 900000));
    EXPECT_EQ(PrecisionTime(3, 200000) - PrecisionTime(1, 200000), PrecisionTime(2, 0));
    EXPECT_EQ(PrecisionTime(1, 0) - PrecisionTime(2, 1), PrecisionTime(-2, 999999));
    EXPECT_EQ(PrecisionTime(2, 123456).GetMilliseconds(), 123);
    EXPECT_EQ(PrecisionTime(2, 123456).GetMicroseconds(), 456);
    const PrecisionTime a(5, 999999), b(6, 0), c(6, 1), negative(-1, 0);
    EXPECT_TRUE(a < b && b < c && a <= b && c > a && c >= c && a != b && negative < a);
}

TEST(PrecisionTime, FromReadingsOfTheClock) {
    struct Case {
        const char* name;
        std::uint64_t frequency, counter;
        std::uint32_t ticks;
        PrecisionTime expected;
    };
    const std::vector<Case> cases{
        {"nanoseconds", 1000000000, 1234567891, 0, {1, 234567}},
        {"truncated, not rounded", 3000000, 2, 0, {0, 0}},
        {"last before it starts again", 1000000, 4294967295, 0, {4294, 967295}},
        {"starts again", 1000000, 4294967296, 0, {0, 0}},
        {"started again many times", 10000000, 3000000000000ULL, 0, {3647, 256576}},
        {"largest counter", 1, ~0ULL, 0, {0, 0}},
        {"milliseconds without a counter", 0, 99, 12345, {12, 345000}},
        {"ticks are signed", 0, 0, 0xFFFFFC17, {-1, -1000}},
    };
    for (const Case& row : cases) {
        PrecisionTime time;
        time.SetFromReadings(row.frequency, row.counter, row.ticks);
        if (row.frequency == 1) {
            EXPECT_LT(time.GetMilliseconds(), 1000) << row.name;  // beyond what a double can tell apart
        } else {
            EXPECT_EQ(time, row.expected) << row.name << ": " << time.GetSeconds() << " s";
        }
    }
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Generic::Utilities
