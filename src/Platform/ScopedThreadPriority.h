#pragma once

#include "Platform/Threads.h"

namespace Varnholt::Platform {

/// Gives the calling thread a priority for the life of a block, however the block is left.
class ScopedThreadPriority final {
  public:
    explicit ScopedThreadPriority(int level) : previous_(CurrentThreadPriority()) {
        SetCurrentThreadPriority(level);
    }
    ~ScopedThreadPriority() { SetCurrentThreadPriority(previous_); }
    ScopedThreadPriority(const ScopedThreadPriority&) = delete;
    ScopedThreadPriority& operator=(const ScopedThreadPriority&) = delete;

  private:
    const int previous_;
};

}  // namespace Varnholt::Platform
