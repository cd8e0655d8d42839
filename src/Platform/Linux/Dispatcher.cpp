#include "Platform/Linux/Dispatcher.h"

#include <pthread.h>

#include <array>
#include <atomic>
#include <utility>

#include "Platform/Linux/MutexObject.h"
#include "Platform/Linux/NoDestructor.h"

namespace Varnholt::Platform::Linux {
namespace {

std::mutex dispatcherMutex;

/// Whoever is to be woken when the lock is let go of; guarded by it.
struct Wakeup {
    WakeCondition condition = nullptr;
    std::shared_ptr<CompletionSource> source;

    void Notify() const {
        if (condition) {
            condition->notify_all();
        }
        if (source) {
            source->Interrupt();
        }
    }
};
NoDestructor<Wakeup> deferredWakeup;

std::atomic<std::uint32_t> threadCount = 0;

thread_local ThreadRecord* currentThread = nullptr;

WakeCondition WakeConditionOf(std::uint32_t thread) {
    constexpr std::size_t WakeConditions = 64;
    static NoDestructor<std::array<std::condition_variable, WakeConditions>> conditions;
    return &(*conditions)[thread % WakeConditions];
}

void ForgetThread(void* record) {
    auto& thread = *static_cast<ThreadRecord*>(record);
    // The mutexes are abandoned under the record's own name.
    ThreadRecord* const before = BindCurrentThread(&thread);
    AbandonOwned(thread);
    BindCurrentThread(before == &thread ? nullptr : before);
}

/// Notices the end of threads that somebody else started. A `thread_local` with a destructor would keep this
/// library from being unloaded for as long as a thread lives that once used it.
class EndOfThreadHook final {
  public:
    EndOfThreadHook() : valid_(pthread_key_create(&key_, ForgetThread) == 0) {}
    ~EndOfThreadHook() {
        if (!valid_) {
            return;
        }
        if (void* const record = pthread_getspecific(key_)) {
            pthread_setspecific(key_, nullptr);
            ForgetThread(record);
        }
        pthread_key_delete(key_);
        valid_ = false;
    }
    EndOfThreadHook(const EndOfThreadHook&) = delete;
    EndOfThreadHook& operator=(const EndOfThreadHook&) = delete;

    void Watch(ThreadRecord& thread) {
        if (valid_) {
            pthread_setspecific(key_, &thread);
        }
    }

  private:
    pthread_key_t key_{};
    bool valid_;
} endOfThread;

}  // namespace

DispatcherLock::DispatcherLock() : std::unique_lock<std::mutex>(dispatcherMutex) {}

DispatcherLock::~DispatcherLock() {
    if (owns_lock()) {
        unlock();
    }
}

void DispatcherLock::unlock() {
    const Wakeup wakeup = std::exchange(*deferredWakeup, {});
    std::unique_lock<std::mutex>::unlock();
    wakeup.Notify();
}

void DispatcherLock::NotifyOnRelease(const WakeCondition& condition) {
    NotifyDeferred();  // one place is enough: hardly anybody wakes two
    (*deferredWakeup).condition = condition;
}

void DispatcherLock::InterruptOnRelease(const std::shared_ptr<CompletionSource>& source) {
    NotifyDeferred();
    (*deferredWakeup).source = source;
}

void DispatcherLock::NotifyDeferred() {
    std::exchange(*deferredWakeup, {}).Notify();
}

ThreadRecord::ThreadRecord() : number(++threadCount), turn(WakeConditionOf(number)) {}

ThreadRecord& CurrentThread() {
    if (!currentThread) {
        thread_local NoDestructor<ThreadRecord> own;
        currentThread = &*own;
        endOfThread.Watch(*currentThread);
    }
    return *currentThread;
}

bool IsCurrentThread(const ThreadRecord& thread) {
    return &thread == currentThread;
}

ThreadRecord* BindCurrentThread(ThreadRecord* thread) {
    return std::exchange(currentThread, thread);
}

void AbandonOwned(ThreadRecord& thread) {
    std::vector<std::shared_ptr<MutexObject>> abandoned;  // may die with this, after the lock is gone
    const DispatcherLock hold;
    abandoned.swap(thread.owned);
    for (const auto& mutex : abandoned) {
        mutex->Abandon();
    }
}

}  // namespace Varnholt::Platform::Linux
