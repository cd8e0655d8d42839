#include "Platform/Linux/MutexObject.h"

#include <pthread.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "Platform/Linux/NamedObjects.h"
#include "Platform/Linux/NoDestructor.h"
#include "Platform/Linux/SharedContent.h"

namespace Varnholt::Platform::Linux {
namespace {

struct MutexContent : Header<MutexContent> {
    static constexpr std::uint64_t Version = 1;
    pthread_mutex_t mutex{};
    /// Of the mutex: its last owner ended, or let go of it, without a release.
    std::uint32_t abandoned = 0;

    bool Initialise() {
        pthread_mutexattr_t attributes;
        if (pthread_mutexattr_init(&attributes) != 0) {
            return false;
        }
        // Recursive, because one thread may come to it through two copies of this library.
        const bool made = pthread_mutexattr_setpshared(&attributes, PTHREAD_PROCESS_SHARED) == 0 &&
                          pthread_mutexattr_setrobust(&attributes, PTHREAD_MUTEX_ROBUST) == 0 &&
                          pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE) == 0 &&
                          pthread_mutex_init(&mutex, &attributes) == 0;
        pthread_mutexattr_destroy(&attributes);
        return made;
    }
};

NoDestructor<NamedObjects<MutexObject>> namedMutexes;

}  // namespace

MutexObject::MutexObject(std::unique_ptr<SharedFile> opened)
    : WaitableObject(ContentIn<MutexContent>(*opened).changes), file_(std::move(opened)) {}

std::shared_ptr<MutexObject> MutexObject::Open(const std::string& name) {
    return (*namedMutexes).Open(name, [&name] {
        if (CurrentClock().IsCooperative()) {
            return std::make_shared<MutexObject>();
        }
        auto file = OpenContent("mutex", name, MutexContent{});
        return file ? std::make_shared<MutexObject>(std::move(file)) : nullptr;
    });
}

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
    bool wasAbandoned = wasAbandoned_;
    if (file_) {
        auto& content = ContentIn<MutexContent>(*file_);
        const int code = pthread_mutex_trylock(&content.mutex);
        if (code == EOWNERDEAD) {
            pthread_mutex_consistent(&content.mutex);
        } else if (code != 0) {
            return Taken::No;
        }
        wasAbandoned = code == EOWNERDEAD || content.abandoned != 0;
    }
    return wasAbandoned ? Taken::Abandoned : Taken::Yes;
}

void MutexObject::LetGo(bool isAbandoned) {
    wasAbandoned_ = isAbandoned;
    if (file_) {
        auto& content = ContentIn<MutexContent>(*file_);
        content.abandoned = isAbandoned;
        pthread_mutex_unlock(&content.mutex);
        content.changes.Increment();
    }
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
    const std::string text = owner_ ? "a mutex owned by thread " + std::to_string(owner_->number) : "a mutex";
    return file_ ? text + " shared between processes" : text;
}

}  // namespace Varnholt::Platform::Linux
