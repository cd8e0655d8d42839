#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <optional>

#include "Platform/EventScheduler.h"
#if !defined(_WIN32)
#include "VirtualClock.h"
#endif

namespace Varnholt::Tests {

/// What a ThreadSanitizer build does with a test's time: threads that take turns, as virtual time has them,
/// hide their races.
enum class TestTime { Virtual, RealForThreadSanitizer };

/// The time of a test: virtual where it can be, real otherwise. The order of threads is the same in every
/// run, unless the test program is told to use others: `--gtest_shuffle --gtest_repeat=100` tries one per
/// repetition, `--gtest_shuffle --gtest_random_seed=N` repeats one.
class TestClock final {
  public:
    explicit TestClock(TestTime time)
        : TestClock(time, static_cast<std::uint64_t>(testing::UnitTest::GetInstance()->random_seed())) {}
    /// For a test that tries orders itself: `SeedsToTry` of them, from 1 on.
    TestClock([[maybe_unused]] TestTime time, [[maybe_unused]] std::uint64_t seed) {
#if !defined(_WIN32)
#if defined(__SANITIZE_THREAD__)
        if (time == TestTime::RealForThreadSanitizer) {
            return;
        }
#endif
        clock_.emplace(seed);
#endif
    }
#if defined(_WIN32) || defined(__SANITIZE_THREAD__)
    static constexpr std::uint64_t SeedsToTry = 1;  // the system decides the order
#else
    static constexpr std::uint64_t SeedsToTry = 500;
#endif

#if defined(_WIN32)
    bool IsVirtual() const {
        return false;
    }
#else
    bool IsVirtual() const {
        return clock_.has_value();
    }

  private:
    std::optional<Simulator::VirtualClock> clock_;
#endif
};

/// Milliseconds since it was made, of the time in force.
class Stopwatch final {
  public:
    explicit Stopwatch(const TestClock& clock) : isExact_(clock.IsVirtual()) {}

    std::uint64_t Milliseconds() const { return (Platform::ClockScheduler().Now() - begin_) / 1000; }
    /// Exactly so long in virtual time; not much longer in real time.
    void Expect(std::uint64_t milliseconds) const { ExpectBetween(milliseconds, milliseconds); }
    void ExpectAtMost(std::uint64_t milliseconds) const { ExpectBetween(0, milliseconds); }
    void ExpectBetween(std::uint64_t least, std::uint64_t most) const {
        const std::uint64_t elapsed = Milliseconds();
        EXPECT_GE(elapsed + (isExact_ ? 0 : 1), least);
        EXPECT_LE(elapsed, most + (isExact_ ? 0 : 2000));
    }

  private:
    const bool isExact_;
    const std::uint64_t begin_ = Platform::ClockScheduler().Now();
};

}  // namespace Varnholt::Tests
