#pragma once

#include "Platform/VirtualClock.h"

namespace Varnholt::Tests {

/// The time of a test that could run on any: virtual here.
class TestClock final {
  public:
    /// Seeds from 1 on that are worth a try.
    static constexpr std::uint64_t Seeds = 500;

    explicit TestClock(std::uint64_t seed = 1) : clock(seed) {}

  private:
    Platform::VirtualClock clock;
};

}  // namespace Varnholt::Tests
