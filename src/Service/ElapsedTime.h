#pragma once

#include <cstdint>

#include "Platform/Time.h"

namespace Varnholt::Service {

/// How long it is since it was made: longer than the platform's count of milliseconds goes, as long as it is
/// asked before that has gone round.
class ElapsedTime final {
  public:
    std::uint64_t Milliseconds() {
        const std::uint32_t now = Platform::TickCount();
        elapsed_ += now - last_;
        last_ = now;
        return elapsed_;
    }
    double Seconds() { return static_cast<double>(Milliseconds()) / 1000; }

  private:
    std::uint32_t last_ = Platform::TickCount();
    std::uint64_t elapsed_ = 0;
};

}  // namespace Varnholt::Service
