#pragma once

#include <memory>
#include <string>
#include <vector>

#include "Platform/CompletionSource.h"
#include "Platform/Linux/Clock.h"

/// The part of the platform that Windows keeps in its kernel: objects that threads wait for.
///
/// One lock, the dispatcher lock, guards every waitable object, every thread record and the virtual clock. It
/// is held for a few instructions at a time, and nothing outside this folder is called meanwhile. No other
/// lock is waited for while it is held: handles are looked up before, and recursive mutexes only tried.
namespace Varnholt::Platform::Linux {

class MutexObject;

/// One thread as the platform knows it. Made by `StartThread`, or for any other thread at its first platform
/// call, which cannot fail for want of memory: the record is then in the thread's own storage.
class ThreadRecord final {
  public:
    ThreadRecord();
    ThreadRecord(const ThreadRecord&) = delete;
    ThreadRecord& operator=(const ThreadRecord&) = delete;

    const std::uint32_t number;  ///< for messages

    // Guarded by the dispatcher lock.
    const WakeCondition turn;
    std::vector<std::shared_ptr<MutexObject>> owned;

    // Only the thread itself uses these.
    int priority = 0;
    int niceShift = 0;  ///< what the priority has changed of the thread's nice value

    // For the virtual clock, guarded by the dispatcher lock.
    enum class State {
        Unknown,  ///< not one of the clock's threads
        Ready,
        Running,
        Blocked,
    };
    State state = State::Unknown;
    BlockedCall* call = nullptr;
    Microseconds deadline = Never;
    bool mustAdvance = false;  ///< nobody can run: this thread is to move the time on
};

/// The calling thread's record.
ThreadRecord& CurrentThread();
bool IsCurrentThread(const ThreadRecord& thread);
/// Binds `thread` to the calling thread until it ends or null is bound; answers what was bound before.
ThreadRecord* BindCurrentThread(ThreadRecord* thread);

/// Releases what a thread that ends, or will not be seen again, still owns; its mutexes are abandoned.
void AbandonOwned(ThreadRecord& thread);

/// A stay inside a call that blocks; lives on the stack of the thread that makes the call.
class BlockedCall {
  public:
    BlockedCall(ThreadRecord& caller, const char* waitedFor) : thread(caller), what_(waitedFor) {}
    virtual ~BlockedCall() = default;
    BlockedCall(const BlockedCall&) = delete;
    BlockedCall& operator=(const BlockedCall&) = delete;

    ThreadRecord& thread;
    bool woken = false;
    bool hopeless = false;                     ///< the virtual clock found that nothing can ever end the call
    std::shared_ptr<CompletionSource> source;  ///< whose events the thread may handle while it is blocked
    bool handlesEvents = false;

    /// For the report of a deadlock: what is waited for.
    virtual std::string Describe() const { return what_; }

  private:
    const char* const what_;
};

}  // namespace Varnholt::Platform::Linux
