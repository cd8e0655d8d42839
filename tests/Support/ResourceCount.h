#pragma once

#include <cstddef>
#include <iosfwd>

namespace Varnholt::TestSupport {

/// What this process has taken from the system, on Linux. Counts that lag behind (a thread that has been
/// joined may still be listed for a moment) are the reason for `Settles`.
struct ResourceCount {
    std::size_t threads = 0;
    std::size_t files = 0;  ///< descriptors
    std::size_t maps = 0;   ///< mapped files

    bool operator==(const ResourceCount&) const = default;

    static ResourceCount Take();
    /// Once the counts no longer change, for a few seconds at most: where calls have gone before.
    static ResourceCount TakeSettled();
    /// Waits until the counts are these, for a few seconds at most, and answers whether they are.
    bool Settles() const;
};

std::ostream& operator<<(std::ostream& stream, const ResourceCount& count);

}  // namespace Varnholt::TestSupport
