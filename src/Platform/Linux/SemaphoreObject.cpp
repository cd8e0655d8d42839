#include "Platform/Linux/SemaphoreObject.h"

namespace Varnholt::Platform::Linux {

ErrorCode SemaphoreObject::Signal(ThreadRecord& /*signaller*/) {
    return Release(1);
}

ErrorCode SemaphoreObject::Release(std::int32_t count) {
    if (count <= 0) {
        return Errors::InvalidParameter;
    }
    if (!Add(count)) {
        return Errors::TooManyPosts;
    }
    OfferToWaiters();
    return Errors::Success;
}

WaitableObject::Taken LocalSemaphore::TryTake(ThreadRecord& /*taker*/) {
    if (available_ == 0) {
        return Taken::No;
    }
    --available_;
    return Taken::Yes;
}

bool LocalSemaphore::Add(std::int32_t count) {
    if (count > maximum_ - available_) {
        return false;
    }
    available_ += count;
    return true;
}

}  // namespace Varnholt::Platform::Linux
