#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <optional>
#include <string>

#ifndef _WIN32
#include "VirtualClock.h"
#endif

namespace Varnholt::Platform {

/// Runs a test on the real clock and, where there is one, on the virtual clock with several orders of
/// threads. Use with `INSTANTIATE_FOR_EACH_CLOCK`.
class EachClock : public testing::TestWithParam<int> {
  public:
    static constexpr int RealClock = -1;

#ifndef _WIN32
    static constexpr int Seeds = 8;

  protected:
    void SetUp() override {
        if (GetParam() != RealClock) {
            clock_.emplace(static_cast<std::uint64_t>(GetParam()));
        }
    }

  private:
    std::optional<Simulator::VirtualClock> clock_;
#else
    static constexpr int Seeds = 0;
#endif
};

inline std::string NameOfClock(const testing::TestParamInfo<int>& info) {
    return info.param == EachClock::RealClock ? "RealClock" : "Seed" + std::to_string(info.param);
}

#define INSTANTIATE_FOR_EACH_CLOCK(suite) \
    INSTANTIATE_TEST_SUITE_P(, suite, testing::Range(EachClock::RealClock, EachClock::Seeds), NameOfClock)

}  // namespace Varnholt::Platform
