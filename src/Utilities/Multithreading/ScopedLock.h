#pragma once

#include "Utilities/Multithreading/Lockable.h"

namespace Varnholt::Utilities::Multithreading {

/// Holds a lock for the life of a block, also when the block is left by an exception.
class ScopedLock final {
  public:
    explicit ScopedLock(Lockable& held) : lockable_(held) { lockable_.Lock(); }
    ~ScopedLock() { lockable_.Unlock(); }
    ScopedLock(const ScopedLock&) = delete;
    ScopedLock& operator=(const ScopedLock&) = delete;

  private:
    Lockable& lockable_;
};

}  // namespace Varnholt::Utilities::Multithreading
