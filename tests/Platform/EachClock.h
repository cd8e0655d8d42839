#pragma once

#include <string>

#include "Support/TestClock.h"

namespace Varnholt::Platform {

/// Runs a test on the real clock and, where there is one, on the virtual clock with several orders of
/// threads. Use with `INSTANTIATE_FOR_EACH_CLOCK`.
class EachClock : public testing::TestWithParam<int> {
  public:
    static constexpr int RealClock = -1;
    static constexpr int Seeds = Tests::TestClock::SeedsToTry > 1 ? 8 : 0;

  protected:
    EachClock() {
        if (GetParam() != RealClock) {
            clock_.emplace(Tests::TestTime::Virtual, static_cast<std::uint64_t>(GetParam()));
        }
    }

  private:
    std::optional<Tests::TestClock> clock_;
};

inline std::string NameOfClock(const testing::TestParamInfo<int>& info) {
    return info.param == EachClock::RealClock ? "RealClock" : "Seed" + std::to_string(info.param);
}

#define INSTANTIATE_FOR_EACH_CLOCK(suite) \
    INSTANTIATE_TEST_SUITE_P(, suite, testing::Range(EachClock::RealClock, EachClock::Seeds), NameOfClock)

}  // namespace Varnholt::Platform
