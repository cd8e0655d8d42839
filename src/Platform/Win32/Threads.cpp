#include "Platform/Threads.h"

#include <memory>
#include <new>

#include "Platform/CallFilter.h"
#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

/// What the system's thread entry, which has a calling convention of its own, calls.
struct Start {
    ThreadEntry entry;
    void* argument;
};

DWORD WINAPI RunThread(void* parameter) {
    const Start start = *std::unique_ptr<Start>(static_cast<Start*>(parameter));
    return start.entry(start.argument);
}

}  // namespace

Handle StartThread(ThreadEntry entry, void* argument) {
    if (CallMustFail("StartThread")) {
        return NoHandle;
    }
    std::unique_ptr<Start> start(new (std::nothrow) Start{entry, argument});
    if (!start) {
        SetLastError(Errors::NotEnoughMemory);
        return NoHandle;
    }
    const HANDLE thread = ::CreateThread(nullptr, 0, RunThread, start.get(), 0, nullptr);
    if (thread != nullptr) {
        static_cast<void>(start.release());  // the thread's now
    }
    return thread;
}

bool EndThreadByForce(Handle thread, std::uint32_t exitCode) {
    // The end is asked for, not done, when the call returns.
    return !CallMustFail("EndThreadByForce") && ::TerminateThread(thread, exitCode) != 0 &&
           ::WaitForSingleObject(thread, 1000) == WAIT_OBJECT_0;
}

int CurrentThreadPriority() {
    const int level = ::GetThreadPriority(::GetCurrentThread());
    return level == THREAD_PRIORITY_ERROR_RETURN ? 0 : level;
}

bool SetCurrentThreadPriority(int level) {
    static_assert(HighestThreadPriority == THREAD_PRIORITY_HIGHEST);
    return !CallMustFail("SetCurrentThreadPriority") && ::SetThreadPriority(::GetCurrentThread(), level) != 0;
}

void SleepMilliseconds(std::uint32_t milliseconds) {
    ::Sleep(milliseconds);
}

}  // namespace Varnholt::Platform
