#include "Platform/Posix/SharedObjects.h"

#include <pthread.h>

#include <atomic>
#include <cerrno>
#include <map>
#include <mutex>

#include "Platform/Posix/Immortal.h"
#include "Platform/Posix/SharedFile.h"

namespace Varnholt::Platform::Posix {
namespace {

/// Tells our memory from other content, and from that of a process with another layout of it.
template <typename Content>
struct Header {
    static constexpr std::uint64_t Magic = 0x4F53545241000000u + Content::Version;
    std::uint64_t magic = Magic;
    std::uint64_t size = sizeof(Content);
    bool IsValid() const { return magic == Magic && size == sizeof(Content); }
};

template <typename Content>
std::unique_ptr<SharedFile> OpenContent(const std::string& kind, const std::string& name,
                                        const Content& initial) {
    return SharedFile::Open(
        kind, name,
        {.size = sizeof(Content),
         .initialise =
             [](void* memory, const void* argument) {
                 return (new (memory) Content(*static_cast<const Content*>(argument)))->Initialise();
             },
         .isValid = [](const void* memory) { return static_cast<const Content*>(memory)->IsValid(); },
         .argument = &initial});
}

struct MutexContent {
    static constexpr std::uint64_t Version = 1;
    Header<MutexContent> header;
    pthread_mutex_t mutex;
    /// Of the mutex: its last owner ended, or let go of it, without a release.
    std::uint32_t abandoned;

    bool Initialise() {
        header = {};
        abandoned = 0;
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
    bool IsValid() const { return header.IsValid(); }
};

/// In this process the base class says which thread owns the mutex; only that thread locks the one that all
/// processes see.
class SharedMutex final : public MutexObject {
  public:
    explicit SharedMutex(std::unique_ptr<SharedFile> opened)
        : file(std::move(opened)), content(*static_cast<MutexContent*>(file->Memory())) {}

    bool IsHeldElsewhere() const override { return !IsOwnedHere(); }
    bool TakenByItsThreadOnly() const override { return true; }
    std::string Describe() const override { return MutexObject::Describe() + " shared between processes"; }

  private:
    Taken TakeFromOthers() override {
        const int code = pthread_mutex_trylock(&content.mutex);
        if (code == EOWNERDEAD) {
            pthread_mutex_consistent(&content.mutex);
            content.abandoned = 0;
            return Taken::Abandoned;
        }
        if (code != 0) {
            return Taken::No;
        }
        return std::exchange(content.abandoned, 0u) != 0 ? Taken::Abandoned : Taken::Yes;
    }
    void GiveToOthers(bool wasAbandoned) override {
        content.abandoned = wasAbandoned;
        pthread_mutex_unlock(&content.mutex);
    }

    const std::unique_ptr<SharedFile> file;
    MutexContent& content;
};

struct SemaphoreContent {
    static constexpr std::uint64_t Version = 0x101;
    Header<SemaphoreContent> header;
    std::int32_t maximum;
    std::int32_t available;  // only through `std::atomic_ref`

    bool Initialise() {
        header = {};
        return true;
    }
    bool IsValid() const { return header.IsValid() && maximum > 0; }
};
static_assert(std::atomic_ref<std::int32_t>::is_always_lock_free, "a process that dies must not keep a lock");

class SharedSemaphore final : public SemaphoreObject {
  public:
    explicit SharedSemaphore(std::unique_ptr<SharedFile> opened)
        : file(std::move(opened)), content(*static_cast<SemaphoreContent*>(file->Memory())) {}

    bool IsHeldElsewhere() const override { return true; }
    Taken TryTake(ThreadRecord& /*taker*/) override {
        const std::atomic_ref available(content.available);
        std::int32_t count = available.load();
        while (count > 0) {
            if (available.compare_exchange_weak(count, count - 1)) {
                return Taken::Yes;
            }
        }
        return Taken::No;
    }

  private:
    bool Add(std::int32_t added) override {
        const std::atomic_ref available(content.available);
        std::int32_t count = available.load();
        do {
            if (count < 0 || count > content.maximum || added > content.maximum - count) {
                return false;
            }
        } while (!available.compare_exchange_weak(count, count + added));
        return true;
    }

    const std::unique_ptr<SharedFile> file;
    SemaphoreContent& content;
};

/// The objects of one kind that this process has open, by name: two handles of one name lead to one object.
template <typename Object>
class OpenObjects final {
  public:
    template <typename Content>
    std::shared_ptr<Object> Open(const std::string& kind, const std::string& name, const Content& initial) {
        const std::lock_guard held(lock);
        std::erase_if(objects, [](const auto& entry) { return entry.second.expired(); });
        const auto found = objects.find(name);
        auto object = found == objects.end() ? nullptr : found->second.lock();
        if (!object) {
            auto file = OpenContent(kind, name, initial);
            if (!file) {
                return nullptr;
            }
            object = std::make_shared<Object>(std::move(file));
            objects[name] = object;
        }
        return object;
    }

  private:
    std::mutex lock;
    std::map<std::string, std::weak_ptr<Object>> objects;  // guarded by `lock`
};

Immortal<OpenObjects<SharedMutex>> openMutexes;
Immortal<OpenObjects<SharedSemaphore>> openSemaphores;

}  // namespace

std::shared_ptr<MutexObject> OpenSharedMutex(const std::string& name) {
    return (*openMutexes).Open("mutex", name, MutexContent{});
}

std::shared_ptr<SemaphoreObject> OpenSharedSemaphore(std::int32_t initialCount, std::int32_t maximumCount,
                                                     const std::string& name) {
    const SemaphoreContent initial{.header = {}, .maximum = maximumCount, .available = initialCount};
    return (*openSemaphores).Open("semaphore", name, initial);
}

}  // namespace Varnholt::Platform::Posix
