#pragma once

#include "Platform/VirtualClock.h"

namespace Varnholt::Tests {

/// The time of a test that could run on any: virtual here.
class TestClock final {
  public:
    explicit TestClock(std::uint64_t seed = 1) : clock(seed) {}

  private:
    Platform::VirtualClock clock;
};

}  // namespace Varnholt::Tests
