#include <limits>
#include <memory>
#include <mutex>
#include <new>

#include "Platform/WaitableObjects.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Multithreading/Condition.h"

namespace Varnholt::Utilities::Multithreading {

using Exceptions::Here;
using Exceptions::ResourceException;
using Platform::WaitResult;

struct ConditionState {
    std::int32_t waitersCount = 0;  ///< threads inside `Wait`; guarded by `waitersCountLock`
    bool wasBroadcast = false;      ///< a broadcast is being delivered; guarded by `waitersCountLock`
    Platform::RecursiveMutex waitersCountLock;
    Platform::OwnedHandle semaphore{
        Platform::MakeSemaphore(0, std::numeric_limits<std::int32_t>::max(), std::string())};
    Platform::OwnedHandle waitersDone{Platform::MakeAutoResetEvent()};
};

/// `waitersCountLock` is innermost and never held while a wait lasts.
class ConditionImpl final : public Condition::Impl {
  public:
    explicit ConditionImpl(Mutex& mutexOfCondition);

    void signal() override;
    void broadcast() override;
    bool Wait(std::int32_t argument) override;

  private:
    /// One waiter less; true when it was the last one that a broadcast waits for.
    bool LeaveWaiters();

    std::unique_ptr<ConditionState> state_;
    Mutex* const mutex_;
};

ConditionImpl::ConditionImpl(Mutex& mutexOfCondition) try : mutex_(&mutexOfCondition) {
    try {
        state_ = std::make_unique<ConditionState>();
    } catch (const std::bad_alloc&) {
        throw ResourceException("ConditionImpl::ConditionImpl() can't allocate!", Here());
    }
    if (!state_->semaphore || !state_->waitersDone) {
        throw ResourceException("ConditionImpl::ConditionImpl() can't create!", Here());
    }
}
TRACED

bool ConditionImpl::LeaveWaiters() {
    const std::lock_guard hold(state_->waitersCountLock);
    --state_->waitersCount;
    return state_->wasBroadcast && state_->waitersCount == 0;
}

void ConditionImpl::signal() try {
    std::int32_t waiters = 0;
    {
        const std::lock_guard hold(state_->waitersCountLock);
        waiters = state_->waitersCount;
    }
    if (waiters > 0 && !Platform::ReleaseSemaphore(state_->semaphore.Get(), 1)) {
        mutex_->Unlock();
        throw ResourceException("Condition::signal() invalid condition!", Here());
    }
}
TRACED

void ConditionImpl::broadcast() try {
    bool released = false;
    {
        // Held over the release, so that the waiters counted are the ones that are let go.
        const std::lock_guard hold(state_->waitersCountLock);
        if (state_->waitersCount <= 0) {
            return;
        }
        if (!state_->wasBroadcast) {
            Platform::Wait(state_->waitersDone.Get(), 0);  // takes away what a failed waiter has left there
        }
        released = Platform::ReleaseSemaphore(state_->semaphore.Get(), state_->waitersCount);
        state_->wasBroadcast = released;
    }
    if (!released) {
        mutex_->Unlock();
        throw ResourceException("Condition::broadcast() unable to release semaphore!", Here());
    }
    const WaitResult done = Platform::Wait(state_->waitersDone.Get(), Platform::Infinite);
    {
        const std::lock_guard hold(state_->waitersCountLock);
        state_->wasBroadcast = false;
    }
    if (done != WaitResult::Signalled) {
        mutex_->Unlock();
        throw ResourceException("Condition::broadcast() invalid event!", Here());
    }
}
TRACED

bool ConditionImpl::Wait(std::int32_t) try {
    {
        const std::lock_guard hold(state_->waitersCountLock);
        ++state_->waitersCount;
    }
    const Platform::Handle mutexHandle = mutex_->impl_->GetHandle();
    if (Platform::SignalAndWait(mutexHandle, state_->semaphore.Get(), Platform::Infinite) !=
        WaitResult::Signalled) {
        // A waiter that was counted and does not wait would keep every later broadcast waiting.
        if (LeaveWaiters()) {
            Platform::SignalEvent(state_->waitersDone.Get());
        }
        Platform::ReleaseMutex(mutexHandle);
        throw ResourceException("Condition::Wait() invalid Mutex! (must be a real mutex)", Here());
    }
    const bool isLast = LeaveWaiters();
    const WaitResult reacquired =
        isLast ? Platform::SignalAndWait(state_->waitersDone.Get(), mutexHandle, Platform::Infinite)
               : Platform::Wait(mutexHandle, Platform::Infinite);
    if (reacquired != WaitResult::Signalled) {
        if (isLast) {
            // Nobody can tell whether that came as far as the signal, without which a broadcast never ends.
            Platform::SignalEvent(state_->waitersDone.Get());
        }
        Platform::ReleaseMutex(mutexHandle);
        throw ResourceException("Condition::Wait() invalid mutex! (must be a real mutex)", Here());
    }
    return true;
}
TRACED

Condition::Condition(Mutex& mutex) : impl_(CreateConditionImpl(mutex)) {}

Tools::SmartPointer<Condition::Impl> CreateConditionImpl(Mutex& mutex) {
    return Tools::SmartPointer<Condition::Impl>(new ConditionImpl(mutex));
}

}  // namespace Varnholt::Utilities::Multithreading
