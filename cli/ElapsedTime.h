#pragma once

#include <cstdint>

#include "Platform/Time.h"

namespace Varnholt::Cli {

/// How long it is since it was made: longer than the platform's count of milliseconds goes, as long as it is
/// asked before that has gone round.
class ElapsedTime final {
  public:
    std::uint64_t Milliseconds() {
        const std::uint32_t now = Platform::TickCount();
        elapsed += now - last;
        last = now;
        return elapsed;
    }

  private:
    std::uint32_t last = Platform::TickCount();
    std::uint64_t elapsed = 0;
};

}  // namespace Varnholt::Cli
