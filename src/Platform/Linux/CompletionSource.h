#pragma once

#include <memory>

#include "Platform/Linux/Clock.h"

namespace Varnholt::Platform::Linux {

/// Where the ends of transfers come from. A source works them off on a thread of its own. The thread that has
/// started a transfer and now waits for it does better to do that itself, because then no change of threads
/// lies between the device and it; while it does, and a little longer, the source's own thread stays asleep.
///
/// One thread at a time works off, between `TryEnter` and the return of `WorkOff`.
class CompletionSource {
  public:
    virtual ~CompletionSource() = default;

    /// With the kernel lock held. False when another thread works off, or there is nothing to do.
    virtual bool TryEnter() = 0;
    /// Without the kernel lock. Returns after it has worked something off, after `Interrupt`, even one since
    /// `TryEnter`, and at `deadline`; now and then for no reason.
    virtual void WorkOff(Microseconds deadline) = 0;
    /// Lets a thread that works off return. Any thread, with or without the kernel lock, at any time.
    virtual void Interrupt() = 0;
};

/// The calling thread has given `source` something to do, and works it off in its coming waits for single
/// objects.
void WorkOffInWaits(const std::weak_ptr<CompletionSource>& source);

}  // namespace Varnholt::Platform::Linux
