#pragma once

#include <memory>
#include <string>

#include "Platform/Linux/SharedFile.h"
#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

/// A recursive mutex owned by a thread. Of one that is shared with other processes, the object says which
/// thread of this process owns it; only that thread locks the one that all processes see.
class MutexObject final : public WaitableObject, public std::enable_shared_from_this<MutexObject> {
  public:
    /// This process's own.
    MutexObject() = default;
    explicit MutexObject(std::unique_ptr<SharedFile> opened);
    /// The one of this name, which all processes of the user share, except where threads take turns: virtual
    /// time cannot wait for other processes, and the tests that run at the same time are to be left alone.
    /// Null on failure with the reason in `LastError`.
    static std::shared_ptr<MutexObject> Open(const std::string& name);

    Taken TryTake(ThreadRecord& taker) override;
    ErrorCode Signal(ThreadRecord& signaller) override { return Release(signaller); }
    bool CanBeTakenForOthers() const override { return !file_; }
    bool IsHeldElsewhere() const override { return file_ && !owner_; }
    void LastHandleClosed(ThreadRecord& closer) override;
    std::string Describe() const override;

    ErrorCode Release(ThreadRecord& releaser);
    /// The owner ends without a release: the next to take the mutex is told so. The caller has taken the
    /// mutex off the owner's list, and runs on the owner's thread.
    void Abandon();

  private:
    /// Where the mutex is kept while no thread of this process owns it: called on the thread that takes it,
    /// and on the one that lets go of it.
    Taken TakeFree();
    void LetGo(bool isAbandoned);

    const std::unique_ptr<SharedFile> file_;  ///< of the one that other processes share
    ThreadRecord* owner_ = nullptr;
    unsigned depth_ = 0;
    bool wasAbandoned_ = false;  ///< by its last owner
};

}  // namespace Varnholt::Platform::Linux
