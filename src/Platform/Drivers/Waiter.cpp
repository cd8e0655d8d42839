#include "Platform/Drivers/Waiter.h"

#include <utility>

#include "Platform/Drivers/RecordState.h"

namespace Varnholt::Platform::Drivers {

void Waiter::Equip(OwnedHandle spare) noexcept {
    event_ = std::move(spare);
    try {
        if (!event_) {
            event_ = OwnedHandle(MakeAutoResetEvent());
        }
    } catch (...) {
        // The wait must go on: a buffer is in use.
    }
}

bool Waiter::AwaitFor(std::uint32_t timeout) noexcept {
    try {
        const WaitResult result = event_ ? Wait(event_.Get(), timeout) : WaitResult::Failed;
        signalled_ = result == WaitResult::Signalled;
        if (result != WaitResult::Failed) {
            return signalled_;
        }
    } catch (...) {
        // As for an event that cannot be made.
    }
    std::uint32_t waited = 0;
    while (!released_.load(std::memory_order_acquire)) {
        if (timeout != Infinite && waited++ >= timeout) {
            return false;
        }
        Pause(1);
    }
    return true;
}

OwnedHandle Waiter::Await() noexcept {
    if (!signalled_) {
        // One that has been released is about to be signalled.
        constexpr std::uint32_t Grace = 1000;
        AwaitFor(released_.load(std::memory_order_acquire) ? Grace : Infinite);
    }
    // A signal that was not seen may still come: such an event is not used again.
    return signalled_ ? std::move(event_) : OwnedHandle();
}

void Waiter::Release(Waiter* first) noexcept {
    while (first != nullptr) {
        Waiter& waiter = *std::exchange(first, first->next);
        const Handle handle = waiter.event_.Get();
        waiter.released_.store(true, std::memory_order_release);
        if (handle != NoHandle) {
            SignalSurely(handle);
        }
    }
}

}  // namespace Varnholt::Platform::Drivers
