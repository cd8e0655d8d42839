#include "VirtualClock.h"

#include <utility>

#include "VirtualTime.h"

namespace Varnholt::Simulator {

VirtualClock::VirtualClock(std::uint64_t seed) : time_(std::make_unique<VirtualTime>(seed)) {}

VirtualClock::~VirtualClock() = default;

std::uint64_t VirtualClock::ElapsedMicroseconds() const {
    return time_->Elapsed();
}

void VirtualClock::HandleDeadlock(DeadlockHandler handler) {
    time_->HandleDeadlock(std::move(handler));
}

}  // namespace Varnholt::Simulator
