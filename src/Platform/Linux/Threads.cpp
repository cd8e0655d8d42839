#include "Platform/Threads.h"

#include <sys/resource.h>
#include <unistd.h>

#include "Platform/CallFilter.h"
#include "Platform/Linux/HandleTable.h"
#include "Platform/Linux/HostSignalsBlocked.h"
#include "Platform/Linux/ThreadObject.h"

namespace Varnholt::Platform {
namespace {

using namespace Linux;

/// What a new thread is given by its maker.
struct Start {
    ThreadEntry entry;
    void* argument;
    std::shared_ptr<ThreadObject> object;
    std::unique_ptr<ThreadRecord> record = std::make_unique<ThreadRecord>();
};

void* RunThread(void* argument) {
    const std::unique_ptr<Start> start(static_cast<Start*>(argument));
    ThreadRecord& record = *start->record;
    BindCurrentThread(&record);
    {
        DispatcherLock hold;
        CurrentClock().ThreadBegins(hold, record);
    }
    start->entry(start->argument);
    AbandonOwned(record);
    {
        DispatcherLock hold;
        start->object->End();
        CurrentClock().ThreadEnds(hold, record);
    }
    BindCurrentThread(nullptr);
    return nullptr;
}

/// A thread's nice value is its own on Linux.
constexpr int NicePerLevel = 5;

Handle StartMadeThread(ThreadEntry entry, void* argument) {
    auto start = std::make_unique<Start>(Start{entry, argument, std::make_shared<ThreadObject>()});
    const std::shared_ptr<ThreadObject> object = start->object;
    ThreadRecord& record = *start->record;
    object->number = record.number;
    OwnedHandle handle(HandleTable::Instance().Add(object));
    {
        DispatcherLock hold;
        CurrentClock().ThreadMade(hold, record);
    }
    bool isRunning = false;
    {
        const HostSignalsBlocked blocked;
        isRunning = pthread_create(&object->thread, nullptr, RunThread, start.get()) == 0;
    }
    if (!isRunning) {
        {
            DispatcherLock hold;
            CurrentClock().ThreadNeverBegan(hold, record);
        }
        handle.Reset();
        SetLastError(Errors::NotEnoughMemory);
        return NoHandle;
    }
    object->MustBeJoined();
    static_cast<void>(start.release());  // the thread's now
    DispatcherLock hold;
    CurrentClock().Preempt(hold);
    return handle.Release();
}

}  // namespace

Handle StartThread(ThreadEntry entry, void* argument) {
    return HandleOf("StartThread", [=] { return StartMadeThread(entry, argument); });
}

bool EndThreadByForce(Handle thread, std::uint32_t /*exitCode*/) {
    if (CallMustFail("EndThreadByForce")) {
        return false;
    }
    if (HandleTable::Instance().FindAs<ThreadObject>(thread)) {
        SetLastError(Errors::NotSupported);
    }
    return false;
}

int CurrentThreadPriority() {
    return CurrentThread().priority;
}

bool SetCurrentThreadPriority(int level) {
    if (CallMustFail("SetCurrentThreadPriority")) {
        return false;
    }
    if (level < -HighestThreadPriority || level > HighestThreadPriority) {
        SetLastError(Errors::InvalidParameter);
        return false;
    }
    ThreadRecord& me = CurrentThread();
    // A level below normal is only remembered: a thread that has become nicer may not go back without a
    // privilege. A level that is refused is remembered too, so that callers find what they have set.
    const int shift = level > 0 ? -NicePerLevel * level : 0;
    if (shift != me.niceShift) {
        const auto self = static_cast<id_t>(gettid());
        const int own = getpriority(PRIO_PROCESS, self) - me.niceShift;
        if (setpriority(PRIO_PROCESS, self, own + shift) == 0) {
            me.niceShift = shift;
        }
    }
    me.priority = level;
    return true;
}

void SleepMilliseconds(std::uint32_t milliseconds) {
    DispatcherLock hold;
    if (milliseconds == 0) {
        CurrentClock().GiveUpSlice(hold);
        return;
    }
    BlockedCall call(CurrentThread(), "the end of a sleep");
    CurrentClock().Block(hold, call, DeadlineAfter(milliseconds));
}

}  // namespace Varnholt::Platform
