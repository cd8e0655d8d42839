#include <limits>
#include <memory>
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
    Platform::CriticalSection waitersCountLock;
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

    std::unique_ptr<ConditionState> state;
    Mutex* const mutex;
};

ConditionImpl::ConditionImpl(Mutex& mutexOfCondition) try : mutex(&mutexOfCondition) {
    try {
        state = std::make_unique<ConditionState>();
    } catch (const std::bad_alloc&) {
        throw ResourceException("ConditionImpl::ConditionImpl() can't allocate!", Here());
    }
    if (!state->semaphore || !state->waitersDone) {
        throw ResourceException("ConditionImpl::ConditionImpl() can't create!", Here());
    }
}
TRACED

bool ConditionImpl::LeaveWaiters() {
    const Platform::CriticalSection::Holder hold(state->waitersCountLock);
    --state->waitersCount;
    return state->wasBroadcast && state->waitersCount == 0;
}

void ConditionImpl::signal() try {
    std::int32_t waiters = 0;
    {
        const Platform::CriticalSection::Holder hold(state->waitersCountLock);
        waiters = state->waitersCount;
    }
    if (waiters > 0 && !Platform::ReleaseSemaphore(state->semaphore.Get(), 1)) {
        mutex->Unlock();
        throw ResourceException("Condition::signal() invalid condition!", Here());
    }
}
TRACED

void ConditionImpl::broadcast() try {
    bool released = false;
    {
        // Held over the release, so that the waiters counted are the ones that are let go.
        const Platform::CriticalSection::Holder hold(state->waitersCountLock);
        if (state->waitersCount <= 0) {
            return;
        }
        if (!state->wasBroadcast) {
            Platform::Wait(state->waitersDone.Get(), 0);  // takes away what a failed waiter has left there
        }
        released = Platform::ReleaseSemaphore(state->semaphore.Get(), state->waitersCount);
        state->wasBroadcast = released;
    }
    if (!released) {
        mutex->Unlock();
        throw ResourceException("Condition::broadcast() unable to release semaphore!", Here());
    }
    const WaitResult done = Platform::Wait(state->waitersDone.Get(), Platform::Infinite);
    {
        const Platform::CriticalSection::Holder hold(state->waitersCountLock);
        state->wasBroadcast = false;
    }
    if (done != WaitResult::Signalled) {
        mutex->Unlock();
        throw ResourceException("Condition::broadcast() invalid event!", Here());
    }
}
TRACED

bool ConditionImpl::Wait(std::int32_t) try {
    {
        const Platform::CriticalSection::Holder hold(state->waitersCountLock);
        ++state->waitersCount;
    }
    const Platform::Handle mutexHandle = mutex->impl->GetHandle();
    if (Platform::SignalAndWait(mutexHandle, state->semaphore.Get(), Platform::Infinite) !=
        WaitResult::Signalled) {
        // A waiter that was counted and does not wait would keep every later broadcast waiting.
        if (LeaveWaiters()) {
            Platform::SignalEvent(state->waitersDone.Get());
        }
        Platform::ReleaseMutex(mutexHandle);
        throw ResourceException("Condition::Wait() invalid Mutex! (must be a real mutex)", Here());
    }
    const bool isLast = LeaveWaiters();
    const WaitResult reacquired =
        isLast ? Platform::SignalAndWait(state->waitersDone.Get(), mutexHandle, Platform::Infinite)
               : Platform::Wait(mutexHandle, Platform::Infinite);
    if (reacquired != WaitResult::Signalled) {
        if (isLast) {
            // Nobody can tell whether that came as far as the signal, without which a broadcast never ends.
            Platform::SignalEvent(state->waitersDone.Get());
        }
        Platform::ReleaseMutex(mutexHandle);
        throw ResourceException("Condition::Wait() invalid mutex! (must be a real mutex)", Here());
    }
    return true;
}
TRACED

Tools::SmartPointer<Condition::Impl> CreateConditionImpl(Mutex& mutex) {
    return Tools::SmartPointer<Condition::Impl>(new ConditionImpl(mutex));
}

}  // namespace Varnholt::Utilities::Multithreading
