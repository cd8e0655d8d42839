#pragma once

#include <cstddef>
#include <memory>
#include <span>
#include <string>

#include "Platform/ErrorCodes.h"
#include "Platform/Linux/Dispatcher.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform::Linux {

class ChangeCount;
class WaitableObject;
class Waiter;

using ObjectRef = std::shared_ptr<WaitableObject>;

/// One of the objects that a wait is for, and the wait's place in its queue. On the stack of the thread that
/// waits: a wait takes no memory.
struct WaitEntry {
    ObjectRef object;
    Waiter* waiter = nullptr;
    WaitEntry* previous = nullptr;
    WaitEntry* next = nullptr;
};

/// Something a thread can wait for. All operations with the dispatcher lock held unless they say otherwise.
///
/// What an object has to give is handed to the threads that wait for it, first come first served, by the
/// thread that makes it available: two signals in a row end two waits, however late the waiting threads run.
class WaitableObject {
  public:
    enum class Taken { No, Yes, Abandoned };

    WaitableObject() = default;
    /// Of an object that other processes share: what they do with it is counted.
    explicit WaitableObject(ChangeCount& sharedChanges) : changes_(&sharedChanges) {}
    virtual ~WaitableObject() = default;
    WaitableObject(const WaitableObject&) = delete;
    WaitableObject& operator=(const WaitableObject&) = delete;

    /// Takes for `taker` what a wait takes, if it is there.
    virtual Taken TryTake(ThreadRecord& taker) = 0;
    /// Signals or releases the object by one, for `SignalAndWait`.
    virtual ErrorCode Signal(ThreadRecord& signaller) = 0;
    /// False when `taker` must be the calling thread; who waits is then woken to take the object himself.
    virtual bool CanBeTakenForOthers() const { return true; }
    /// True when another process may have to make the object available.
    virtual bool IsHeldElsewhere() const { return false; }
    /// Counts what may have made it so. Null where no other process has the object.
    ChangeCount* SharedChanges() const { return changes_; }
    /// Where its signal comes from, when that is a transfer's end.
    virtual std::shared_ptr<CompletionSource> SignalledBy() const { return nullptr; }
    /// After a wait of the caller has taken the object, without the dispatcher lock.
    virtual void AfterWait() {}
    /// The last handle is closed by `closer`.
    virtual void LastHandleClosed(ThreadRecord& /*closer*/) {}
    virtual std::string Describe() const = 0;

  protected:
    void OfferToWaiters();

  private:
    friend class Waiter;
    void Enqueue(WaitEntry& entry);
    void Dequeue(WaitEntry& entry);
    WaitEntry* first_ = nullptr;  ///< has waited longest
    WaitEntry* last_ = nullptr;
    friend class HandleTable;
    std::size_t handles_ = 0;
    ChangeCount* const changes_ = nullptr;
};

/// Waits until the object of one of `entries` could be taken for the calling thread. With the dispatcher lock
/// held; lets go of it while blocked.
WaitAnyResult WaitForAny(DispatcherLock& hold, std::span<WaitEntry> entries, Microseconds deadline);

}  // namespace Varnholt::Platform::Linux
