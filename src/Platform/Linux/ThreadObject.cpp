#include "Platform/Linux/ThreadObject.h"

namespace Varnholt::Platform::Linux {

ThreadObject::~ThreadObject() {
    // The last reference is often the thread's own.
    if (!joined_ && pthread_equal(thread, pthread_self())) {
        pthread_detach(thread);
    } else {
        JoinOnce();
    }
}

WaitableObject::Taken ThreadObject::TryTake(ThreadRecord& /*taker*/) {
    return ended_ ? Taken::Yes : Taken::No;
}

ErrorCode ThreadObject::Signal(ThreadRecord& /*signaller*/) {
    return Errors::InvalidHandle;
}

void ThreadObject::AfterWait() {
    JoinOnce();
}

void ThreadObject::JoinOnce() {
    if (!joined_.exchange(true)) {
        pthread_join(thread, nullptr);
    }
}

std::string ThreadObject::Describe() const {
    return "the end of thread " + std::to_string(number);
}

void ThreadObject::End() {
    ended_ = true;
    OfferToWaiters();
}

}  // namespace Varnholt::Platform::Linux
