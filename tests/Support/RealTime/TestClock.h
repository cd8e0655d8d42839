#pragma once

#include <cstdint>

namespace Varnholt::Tests {

/// The time of a test that could run on any: real where there is no virtual one, and where threads must not
/// take turns, because a race between them is what is looked for.
class TestClock final {
  public:
    /// Seeds from 1 on that are worth a try.
    static constexpr std::uint64_t Seeds = 1;

    explicit TestClock(std::uint64_t /*seed*/ = 1) {}
};

}  // namespace Varnholt::Tests
