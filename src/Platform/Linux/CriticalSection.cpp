#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <new>

#include "Platform/Linux/Kernel.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform {

using namespace Linux;

namespace {

class EnteringSection final : public BlockedCall {
  public:
    EnteringSection(ThreadRecord& caller, std::uint32_t ownersNumber)
        : BlockedCall(caller), owner_(ownersNumber) {}
    std::string Describe() const override {
        return "a critical section owned by thread " + std::to_string(owner_);
    }

    EnteringSection* next = nullptr;

  private:
    const std::uint32_t owner_;
};

}  // namespace

/// The section's own lock, and not the kernel lock, keeps the threads apart: a tool that looks for data races
/// then sees exactly the order that the section makes.
struct CriticalSection::Impl {
    std::mutex lock;
    std::atomic<const ThreadRecord*> owner = nullptr;
    unsigned depth = 0;  // of the owner only

    // Where threads take turns. Guarded by the kernel lock; the first two are the owner's.
    bool ownerTakesTurns = false;
    std::uint32_t ownersNumber = 0;
    EnteringSection* entering = nullptr;

    void EnterInTurn(ThreadRecord& me, Clock& clock);
    void LeaveInTurn(Clock& clock);
};

void CriticalSection::Impl::EnterInTurn(ThreadRecord& me, Clock& clock) {
    KernelHold hold;
    clock.Preempt(hold);
    const bool takesTurns = me.state == ThreadRecord::State::Running;
    while (!lock.try_lock()) {
        if (!takesTurns || !ownerTakesTurns) {
            // One of the two is a thread of its own, which goes on while this one waits.
            hold.unlock();
            lock.lock();
            hold.lock();
            break;
        }
        EnteringSection call(me, ownersNumber);
        EnteringSection** last = &entering;
        while (*last) {
            last = &(*last)->next;
        }
        *last = &call;
        clock.Block(hold, call, Never);
        EnteringSection** link = &entering;
        while (*link != &call) {
            link = &(*link)->next;
        }
        *link = call.next;
        if (call.hopeless) {
            std::fprintf(stderr, "A critical section that is never left cannot be entered.\n");
            std::abort();
        }
    }
    ownerTakesTurns = takesTurns;
    ownersNumber = me.number;
}

void CriticalSection::Impl::LeaveInTurn(Clock& clock) {
    KernelHold hold;
    lock.unlock();
    for (EnteringSection* call = entering; call; call = call->next) {
        clock.Wake(*call);
    }
    clock.Preempt(hold);
}

CriticalSection::CriticalSection() {
    static_assert(sizeof(Impl) <= ImplSize && alignof(Impl) <= alignof(void*));
    std::construct_at(reinterpret_cast<Impl*>(storage_));
}

CriticalSection::~CriticalSection() {
    std::destroy_at(&Own());
}

CriticalSection::Impl& CriticalSection::Own() {
    return *std::launder(reinterpret_cast<Impl*>(storage_));
}

void CriticalSection::Enter() {
    Impl& impl = Own();
    ThreadRecord& me = CurrentThread();
    if (impl.owner.load(std::memory_order_relaxed) != &me) {
        Clock& clock = CurrentClock();
        if (clock.TakesTurns()) {
            impl.EnterInTurn(me, clock);
        } else {
            impl.lock.lock();
        }
        impl.owner.store(&me, std::memory_order_relaxed);
        ++me.sectionsHeld;
    }
    ++impl.depth;
}

void CriticalSection::Leave() {
    Impl& impl = Own();
    if (--impl.depth > 0) {
        return;
    }
    impl.owner.store(nullptr, std::memory_order_relaxed);
    --CurrentThread().sectionsHeld;
    Clock& clock = CurrentClock();
    if (clock.TakesTurns()) {
        impl.LeaveInTurn(clock);
    } else {
        impl.lock.unlock();
    }
}

}  // namespace Varnholt::Platform
