#pragma once

#include <cstdint>

namespace Varnholt::Platform {

/// Where the ends of transfers come from. A source handles their events on a thread of its own. A thread that
/// waits for the end of one does better to handle them itself, because then no change of threads lies between
/// the device and it; while it does, and a little longer, the source's own thread stays asleep.
///
/// One thread at a time handles events, between `TryBegin` and the return of `HandleEvents`.
class CompletionSource {
  public:
    virtual ~CompletionSource() = default;

    /// False when another thread handles events, or there are none to come. Called with a lock of the
    /// platform held: must not block.
    virtual bool TryBegin() = 0;
    /// Returns after it has handled something, after `Interrupt`, even one since `TryBegin`, and at
    /// `deadline` (microseconds of the platform's clock); now and then for no reason.
    virtual void HandleEvents(std::uint64_t deadline) = 0;
    /// Lets a thread that handles events return. Any thread, at any time; must not block.
    virtual void Interrupt() = 0;
};

}  // namespace Varnholt::Platform
