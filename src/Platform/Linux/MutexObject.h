#pragma once

#include <string>

#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

/// A recursive mutex owned by a thread. A mutex that is shared with other processes derives from it.
class MutexObject : public WaitableObject, public std::enable_shared_from_this<MutexObject> {
  public:
    Taken TryTake(ThreadRecord& taker) final;
    ErrorCode Signal(ThreadRecord& signaller) final { return Release(signaller); }
    void LastHandleClosed(ThreadRecord& closer) final;
    std::string Describe() const override;

    ErrorCode Release(ThreadRecord& releaser);
    /// The owner ends without a release: the next to take the mutex is told so. The caller has taken the
    /// mutex off the owner's list, and runs on the owner's thread.
    void Abandon();

  protected:
    bool IsOwnedHere() const { return owner_ != nullptr; }

  private:
    /// Where the mutex is kept while no thread of this process owns it: called on the thread that takes it,
    /// and on the one that lets go of it.
    virtual Taken TakeFree();
    virtual void LetGo(bool isAbandoned);

    ThreadRecord* owner_ = nullptr;
    unsigned depth_ = 0;
    bool wasAbandoned_ = false;  ///< by its last owner
};

}  // namespace Varnholt::Platform::Linux
