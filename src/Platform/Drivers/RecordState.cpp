#include "Platform/Drivers/RecordState.h"

#include <atomic>

#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform::Drivers {
namespace {

/// No driver's code has these values. The first is what Windows uses.
constexpr std::uintptr_t Pending = 0x103;
/// The outcome is known, the event is about to be signalled. Who asks now waits for the few instructions
/// until that has happened: a record that reads as ended must not be signalled any more, because its event
/// may then serve another request or be gone.
constexpr std::uintptr_t Signalling = 0x104;

std::atomic_ref<std::uintptr_t> StateOf(const Overlapped& record) {
    return std::atomic_ref<std::uintptr_t>(const_cast<Overlapped&>(record).internal);
}

/// Signals an event that somebody may wait for without limit.
void SignalSurely(Handle event) noexcept {
    // A system's driver does not signal through a call that can run out of memory or that a test can make
    // fail: the first failure may be one of these.
    for (int attempt = 0; attempt < 2; ++attempt) {
        try {
            if (SignalEvent(event)) {
                return;
            }
        } catch (...) {
        }
    }
}

}  // namespace

bool IsRunning(const Overlapped& record) {
    constexpr int Yields = 64;
    for (int round = 0;; ++round) {
        const std::uintptr_t state = StateOf(record).load(std::memory_order_acquire);
        if (state != Signalling) {
            return state == Pending;
        }
        // Yielding alone could go on for ever if the signalling thread has a lower priority.
        SleepMilliseconds(round < Yields ? 0 : 1);
    }
}

ErrorCode OutcomeOf(const Overlapped& record, std::uint32_t& transferred) {
    const std::uintptr_t state = StateOf(record).load(std::memory_order_acquire);
    transferred = static_cast<std::uint32_t>(record.internalHigh);
    return static_cast<ErrorCode>(state);
}

void MarkRunning(Overlapped& record, const std::shared_ptr<CompletionSource>& source) {
    if (record.event != NoHandle) {
        ResetEvent(record.event, source);
    }
    record.internalHigh = 0;
    StateOf(record).store(Pending, std::memory_order_release);
}

void MarkEnded(Overlapped& record, ErrorCode code, std::uint32_t transferred) {
    record.internalHigh = transferred;
    if (record.event != NoHandle) {
        const Handle event = record.event;
        StateOf(record).store(Signalling, std::memory_order_release);
        SignalSurely(event);
    }
    StateOf(record).store(code, std::memory_order_release);
}

bool RefuseStart(Overlapped& record, ErrorCode code) {
    record.internalHigh = 0;
    StateOf(record).store(code, std::memory_order_release);
    SetLastError(code);
    return false;
}

}  // namespace Varnholt::Platform::Drivers
