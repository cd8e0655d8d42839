#pragma once

#include "Utilities/Multithreading/Lockable.h"

namespace Varnholt::Utilities::Multithreading {

/// A lock that can be waited for with a limit.
class TryLockable : public Lockable {
  public:
    /// Waits at most `timeout` milliseconds (negative: without limit); false when the time ran out.
    virtual bool TryLock(int timeout) = 0;
};

}  // namespace Varnholt::Utilities::Multithreading
