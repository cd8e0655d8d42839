#pragma once

namespace Varnholt::Utilities::Multithreading {

/// Something that is locked and unlocked. `ScopedLock` holds one for a block.
class Lockable {
  public:
    virtual ~Lockable() = default;
    virtual void Lock() = 0;
    virtual void Unlock() = 0;
};

}  // namespace Varnholt::Utilities::Multithreading
