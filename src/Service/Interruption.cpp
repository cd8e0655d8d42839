#include "Service/Interruption.h"

#include <mutex>
#include <utility>

#include "Service/Failure.h"

namespace Varnholt::Service {

void Interruption::Request() {
    requested_ = true;
    Platform::SignalEvent(event_.Get());
    const std::lock_guard holder(section_);
    if (action_ && deferrals_ == 0) {
        action_();
    }
}

void Interruption::Withdraw() {
    requested_ = false;
    Platform::Wait(event_.Get(), 0);
}

bool Interruption::Sleep(std::uint32_t milliseconds) const {
    if (!requested_) {
        Platform::Wait(event_.Get(), milliseconds);
    }
    return !requested_;
}

void Interruption::ThrowIfRequested() const {
    if (requested_) {
        throw Failure(FailureKind::Interrupted, "interrupted");
    }
}

void Interruption::SetAction(std::function<void()> whenRequested) {
    const std::lock_guard holder(section_);
    action_ = std::move(whenRequested);
}

}  // namespace Varnholt::Service
