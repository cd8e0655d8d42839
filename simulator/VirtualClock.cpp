#include "VirtualClock.h"

#include <utility>

#include "VirtualTime.h"

namespace Varnholt::Simulator {

class VirtualClock::Impl final {
  public:
    explicit Impl(std::uint64_t seed) : time(seed) {}
    VirtualTime time;
};

VirtualClock::VirtualClock(std::uint64_t seed) : impl_(std::make_unique<Impl>(seed)) {}

VirtualClock::~VirtualClock() = default;

std::uint64_t VirtualClock::ElapsedMicroseconds() const {
    return impl_->time.Elapsed();
}

void VirtualClock::HandleDeadlock(DeadlockHandler handler) {
    impl_->time.HandleDeadlock(std::move(handler));
}

}  // namespace Varnholt::Simulator
