#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <mutex>

#include "Platform/Linux/Dispatcher.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform {

using namespace Linux;

/// The mutex's own lock, and not the dispatcher lock, keeps the threads apart: a tool that looks for data
/// races then sees exactly the order that the mutex makes.
struct RecursiveMutex::Impl {
    class LockingCall final : public BlockedCall {
      public:
        LockingCall(ThreadRecord& caller, std::uint32_t ownersNumber)
            : BlockedCall(caller), owner_(ownersNumber) {}
        std::string Describe() const override { return "a mutex owned by thread " + std::to_string(owner_); }

        LockingCall* next = nullptr;

      private:
        const std::uint32_t owner_;
    };

    std::mutex lock;
    std::atomic<const ThreadRecord*> owner = nullptr;
    unsigned depth = 0;  // of the owner only

    // Where threads take turns. Guarded by the dispatcher lock; the first two are the owner's.
    bool ownerIsCooperative = false;
    std::uint32_t ownersNumber = 0;
    LockingCall* waiting = nullptr;

    void LockCooperatively(ThreadRecord& me, Clock& clock);
    void UnlockCooperatively(Clock& clock);
};

void RecursiveMutex::Impl::LockCooperatively(ThreadRecord& me, Clock& clock) {
    DispatcherLock hold;
    clock.Preempt(hold);
    const bool isCooperative = me.state == ThreadRecord::State::Running;
    while (!lock.try_lock()) {
        if (!isCooperative || !ownerIsCooperative) {
            // One of the two is a thread of its own, which goes on while this one waits.
            hold.unlock();
            lock.lock();
            hold.lock();
            break;
        }
        LockingCall call(me, ownersNumber);
        LockingCall** last = &waiting;
        while (*last) {
            last = &(*last)->next;
        }
        *last = &call;
        clock.Block(hold, call, Never);
        LockingCall** link = &waiting;
        while (*link != &call) {
            link = &(*link)->next;
        }
        *link = call.next;
        if (call.hopeless) {
            static_cast<void>(std::fputs("A mutex that is never unlocked cannot be locked.\n", stderr));
            std::abort();
        }
    }
    ownerIsCooperative = isCooperative;
    ownersNumber = me.number;
}

void RecursiveMutex::Impl::UnlockCooperatively(Clock& clock) {
    DispatcherLock hold;
    lock.unlock();
    for (LockingCall* call = waiting; call; call = call->next) {
        clock.Wake(*call);
    }
    clock.Preempt(hold);
}

RecursiveMutex::RecursiveMutex() = default;
RecursiveMutex::~RecursiveMutex() = default;

void RecursiveMutex::lock() {
    Impl& impl = *impl_;
    ThreadRecord& me = CurrentThread();
    if (impl.owner.load(std::memory_order_relaxed) != &me) {
        Clock& clock = CurrentClock();
        if (clock.IsCooperative()) {
            impl.LockCooperatively(me, clock);
        } else {
            impl.lock.lock();
        }
        impl.owner.store(&me, std::memory_order_relaxed);
        ++me.recursiveMutexesHeld;
    }
    ++impl.depth;
}

void RecursiveMutex::unlock() {
    Impl& impl = *impl_;
    if (--impl.depth > 0) {
        return;
    }
    impl.owner.store(nullptr, std::memory_order_relaxed);
    --CurrentThread().recursiveMutexesHeld;
    Clock& clock = CurrentClock();
    if (clock.IsCooperative()) {
        impl.UnlockCooperatively(clock);
    } else {
        impl.lock.unlock();
    }
}

}  // namespace Varnholt::Platform
