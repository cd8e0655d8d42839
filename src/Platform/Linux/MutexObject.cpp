#include "Platform/Linux/MutexObject.h"

#include <algorithm>

namespace Varnholt::Platform::Linux {

WaitableObject::Taken MutexObject::TryTake(ThreadRecord& taker) {
    if (owner_ == &taker) {
        ++depth_;
        return Taken::Yes;
    }
    if (owner_) {
        return Taken::No;
    }
    taker.owned.reserve(taker.owned.size() + 1);  // nothing may fail once the mutex is taken
    const Taken taken = TakeFree();
    if (taken != Taken::No) {
        taker.owned.push_back(shared_from_this());
        owner_ = &taker;
        depth_ = 1;
    }
    return taken;
}

WaitableObject::Taken MutexObject::TakeFree() {
    return wasAbandoned_ ? Taken::Abandoned : Taken::Yes;
}

void MutexObject::LetGo(bool isAbandoned) {
    wasAbandoned_ = isAbandoned;
}

ErrorCode MutexObject::Release(ThreadRecord& releaser) {
    if (owner_ != &releaser) {
        return Errors::NotOwner;
    }
    if (--depth_ > 0) {
        return Errors::Success;
    }
    std::erase_if(releaser.owned, [this](const auto& owned) { return owned.get() == this; });
    owner_ = nullptr;
    LetGo(false);
    OfferToWaiters();
    return Errors::Success;
}

void MutexObject::Abandon() {
    owner_ = nullptr;
    depth_ = 0;
    LetGo(true);
    OfferToWaiters();
}

void MutexObject::LastHandleClosed(ThreadRecord& closer) {
    if (owner_ == &closer) {
        std::erase_if(closer.owned, [this](const auto& owned) { return owned.get() == this; });
        Abandon();
    }
}

std::string MutexObject::Describe() const {
    return owner_ ? "a mutex owned by thread " + std::to_string(owner_->number) : "a mutex";
}

}  // namespace Varnholt::Platform::Linux
