#include <array>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <mutex>
#include <utility>

#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform {

using namespace Linux;

/// The mutex's own lock, and not the dispatcher lock, keeps the threads apart: a tool that looks for data
/// races then sees exactly the order that the mutex makes. Where threads take turns, they wait for the object
/// and then try again.
struct RecursiveMutex::Impl final : WaitableObject {
    Taken TryTake(ThreadRecord& /*taker*/) override {
        return std::exchange(wasUnlocked, false) ? Taken::Yes : Taken::No;
    }
    ErrorCode Signal(ThreadRecord& /*signaller*/) override {
        wasUnlocked = true;
        OfferToWaiters();
        return Errors::Success;
    }
    std::string Describe() const override {
        return "a mutex owned by thread " + std::to_string(ownersNumber);
    }
    void LockCooperatively(ThreadRecord& me, Clock& clock);

    std::mutex lock;
    std::atomic<const ThreadRecord*> owner = nullptr;
    unsigned depth = 0;  // of the owner only

    // Where threads take turns. Guarded by the dispatcher lock; the last two are the owner's.
    bool wasUnlocked = false;
    bool ownerIsCooperative = false;
    std::uint32_t ownersNumber = 0;
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
        std::array entries{WaitEntry{ObjectRef(ObjectRef(), this)}};  // its owner keeps it alive
        if (WaitForAny(hold, entries, Never).result == WaitResult::Failed) {
            static_cast<void>(std::fputs("A mutex that is never unlocked cannot be locked.\n", stderr));
            std::abort();
        }
    }
    ownerIsCooperative = isCooperative;
    ownersNumber = me.number;
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
    }
    ++impl.depth;
}

void RecursiveMutex::unlock() {
    Impl& impl = *impl_;
    if (--impl.depth > 0) {
        return;
    }
    impl.owner.store(nullptr, std::memory_order_relaxed);
    Clock& clock = CurrentClock();
    if (clock.IsCooperative()) {
        DispatcherLock hold;
        impl.lock.unlock();
        impl.Signal(CurrentThread());
        clock.Preempt(hold);
    } else {
        impl.lock.unlock();
    }
}

}  // namespace Varnholt::Platform
