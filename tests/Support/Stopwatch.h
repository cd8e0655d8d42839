#pragma once

#include <cstdint>

#include "Platform/Time.h"

namespace Varnholt::Tests {

/// Time since its construction, on the clock in force.
class Stopwatch final {
  public:
    std::uint64_t Milliseconds() const {
        return (Platform::PerformanceCounter() - start) * 1000 / Platform::PerformanceFrequency();
    }

  private:
    const std::uint64_t start = Platform::PerformanceCounter();
};

}  // namespace Varnholt::Tests
