#include "Interruption.h"

#include <utility>

#include "Failure.h"

namespace Varnholt::Cli {

Interruption::Interruption() : event(Platform::MakeAutoResetEvent()) {}

void Interruption::Request() {
    requested = true;
    Platform::SignalEvent(event.Get());
    const Platform::CriticalSection::Holder holder(section);
    if (action && deferrals == 0) {
        action();
    }
}

bool Interruption::Sleep(std::uint32_t milliseconds) const {
    if (!requested && milliseconds > 0) {
        Platform::Wait(event.Get(), milliseconds);
    }
    return !requested;
}

void Interruption::ThrowIfRequested() const {
    if (requested) {
        throw ToolFailure(ExitCode::Interrupted, "interrupted");
    }
}

void Interruption::SetAction(std::function<void()> whenRequested) {
    const Platform::CriticalSection::Holder holder(section);
    action = std::move(whenRequested);
}

}  // namespace Varnholt::Cli
