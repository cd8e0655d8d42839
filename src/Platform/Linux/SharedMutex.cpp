#include "Platform/Linux/SharedMutex.h"

#include <pthread.h>

#include <cerrno>

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

/// In this process the base class says which thread owns the mutex; only that thread locks the one that all
/// processes see.
class SharedMutex final : public SharedObject<MutexObject, MutexContent> {
  public:
    using SharedObject::SharedObject;

    bool CanBeTakenForOthers() const override { return false; }
    bool IsHeldElsewhere() const override { return !IsOwnedHere(); }
    std::string Describe() const override { return MutexObject::Describe() + " shared between processes"; }

  private:
    Taken TakeFree() override {
        const int code = pthread_mutex_trylock(&content_.mutex);
        if (code == EOWNERDEAD) {
            pthread_mutex_consistent(&content_.mutex);
            return Taken::Abandoned;
        }
        if (code != 0) {
            return Taken::No;
        }
        return content_.abandoned != 0 ? Taken::Abandoned : Taken::Yes;
    }
    void LetGo(bool isAbandoned) override {
        content_.abandoned = isAbandoned;
        pthread_mutex_unlock(&content_.mutex);
        content_.changes.Increment();
    }
};

}  // namespace

std::shared_ptr<MutexObject> OpenSharedMutex(const std::string& name) {
    auto file = OpenContent("mutex", name, MutexContent{});
    return file ? std::make_shared<SharedMutex>(std::move(file)) : nullptr;
}

}  // namespace Varnholt::Platform::Linux
