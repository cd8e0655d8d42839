#include "Platform/Linux/EventObject.h"

#include <utility>

namespace Varnholt::Platform::Linux {

WaitableObject::Taken EventObject::TryTake(ThreadRecord& /*taker*/) {
    return std::exchange(signalled_, false) ? Taken::Yes : Taken::No;
}

void EventObject::Reset(const std::shared_ptr<CompletionSource>& source) {
    signalled_ = false;
    source_ = source;
}

ErrorCode EventObject::Signal(ThreadRecord& /*signaller*/) {
    signalled_ = true;
    OfferToWaiters();
    return Errors::Success;
}

}  // namespace Varnholt::Platform::Linux
