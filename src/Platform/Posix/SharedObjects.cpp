#include "Platform/Posix/SharedObjects.h"

#include <linux/futex.h>
#include <pthread.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <limits>
#include <map>
#include <mutex>

#include "Platform/Posix/Immortal.h"
#include "Platform/Posix/SharedFile.h"

namespace Varnholt::Platform::Posix {
namespace {

/// Lets the threads of all processes wait until an object may have become available. A process may die at any
/// point of it: then a wake-up is tried for nobody, or a sleeper wakes a little later.
class ChangeCount final {
  public:
    std::uint32_t Get() const { return std::atomic_ref(changes).load(); }

    void Increment() {
        ++std::atomic_ref(changes);
        if (std::atomic_ref(sleepers).load() != 0) {
            syscall(SYS_futex, &changes, FUTEX_WAKE, std::numeric_limits<int>::max(), nullptr, nullptr, 0);
        }
    }

    void Await(std::uint32_t seen, Microseconds limit) {
        const timespec timeout{static_cast<time_t>(limit / 1'000'000),
                               static_cast<long>(limit % 1'000'000 * 1000)};
        ++std::atomic_ref(sleepers);
        syscall(SYS_futex, &changes, FUTEX_WAIT, seen, &timeout, nullptr, 0);
        --std::atomic_ref(sleepers);
    }

  private:
    // Only through `std::atomic_ref`.
    mutable std::uint32_t changes = 0;
    std::uint32_t sleepers = 0;
};
static_assert(std::atomic_ref<std::uint32_t>::is_always_lock_free,
              "a process that dies must not keep a lock");

/// Begins the content of every file; tells our memory from other content, and from that of a process with
/// another layout of it.
template <typename Content>
struct Header {
    static constexpr std::uint64_t Magic = 0x4F53545241000000u + Content::Version;
    std::uint64_t magic = Magic;
    std::uint64_t size = sizeof(Content);
    ChangeCount changes;
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

    bool CanBeTakenForOthers() const override { return false; }
    bool IsHeldElsewhere() const override { return !IsOwnedHere(); }
    std::uint32_t Changes() const override { return content.header.changes.Get(); }
    void AwaitChange(std::uint32_t seen, Microseconds limit) override {
        content.header.changes.Await(seen, limit);
    }
    std::string Describe() const override { return MutexObject::Describe() + " shared between processes"; }

  private:
    Taken TakeFree() override {
        const int code = pthread_mutex_trylock(&content.mutex);
        if (code == EOWNERDEAD) {
            pthread_mutex_consistent(&content.mutex);
            return Taken::Abandoned;
        }
        if (code != 0) {
            return Taken::No;
        }
        return content.abandoned != 0 ? Taken::Abandoned : Taken::Yes;
    }
    void LetGo(bool isAbandoned) override {
        content.abandoned = isAbandoned;
        pthread_mutex_unlock(&content.mutex);
        content.header.changes.Increment();
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

class SharedSemaphore final : public SemaphoreObject {
  public:
    explicit SharedSemaphore(std::unique_ptr<SharedFile> opened)
        : file(std::move(opened)), content(*static_cast<SemaphoreContent*>(file->Memory())) {}

    bool IsHeldElsewhere() const override { return true; }
    std::uint32_t Changes() const override { return content.header.changes.Get(); }
    void AwaitChange(std::uint32_t seen, Microseconds limit) override {
        content.header.changes.Await(seen, limit);
    }
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
        content.header.changes.Increment();
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
