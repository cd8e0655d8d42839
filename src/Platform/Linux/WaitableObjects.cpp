#include "Platform/WaitableObjects.h"

#include <array>
#include <new>

#include "Platform/CallFilter.h"
#include "Platform/Linux/EventObject.h"
#include "Platform/Linux/HandleTable.h"
#include "Platform/Linux/MutexObject.h"
#include "Platform/Linux/SemaphoreObject.h"

namespace Varnholt::Platform {
namespace {

using namespace Linux;

/// The limit that Windows sets.
constexpr std::size_t MostObjectsPerWait = 64;

bool Succeeded(ErrorCode code) {
    if (code != Errors::Success) {
        SetLastError(code);
    }
    return code == Errors::Success;
}

Handle AddIfMade(ObjectRef object) {
    return object ? HandleTable::Instance().Add(std::move(object)) : NoHandle;
}

/// Runs `action` on the object with the dispatcher lock held, where another thread may go first and last.
template <typename Kind, typename Action>
bool OnObject(Handle handle, Action action) {
    const auto object = HandleTable::Instance().FindAs<Kind>(handle);
    if (!object) {
        return false;
    }
    DispatcherLock hold;
    CurrentClock().Preempt(hold);
    const ErrorCode code = action(*object);
    CurrentClock().Preempt(hold);
    return Succeeded(code);
}

/// Signals the object first, if there is one. Throws nothing, because destructors wait: a mutex that there is
/// no memory to own is not acquired.
WaitAnyResult WaitForObjects(std::span<WaitEntry> entries, std::uint32_t timeout,
                             WaitableObject* toSignal = nullptr) try {
    const Microseconds deadline = DeadlineAfter(timeout);
    WaitAnyResult outcome{};
    {
        DispatcherLock hold;
        CurrentClock().Preempt(hold);
        if (toSignal && !Succeeded(toSignal->Signal(CurrentThread()))) {
            return {WaitResult::Failed, 0};
        }
        outcome = WaitForAny(hold, entries, deadline);
    }
    if (outcome.result == WaitResult::Signalled) {
        entries[outcome.index].object->AfterWait();
    }
    return outcome;
} catch (const std::bad_alloc&) {
    SetLastError(Errors::NotEnoughMemory);
    return {WaitResult::Failed, 0};
}

}  // namespace

Handle MakeAutoResetEvent() {
    return HandleOf("MakeAutoResetEvent", [] { return AddIfMade(std::make_shared<EventObject>()); });
}

bool SignalEvent(Handle event) {
    return !CallMustFail("SignalEvent") &&
           OnObject<EventObject>(event, [](EventObject& object) { return object.Signal(CurrentThread()); });
}

void ResetEvent(Handle event, const std::shared_ptr<CompletionSource>& source) {
    OnObject<EventObject>(event, [&](EventObject& object) {
        object.Reset(source);
        return Errors::Success;
    });
}

Handle MakeMutex(const std::string& name) {
    return HandleOf("MakeMutex", [&] {
        return AddIfMade(name.empty() ? std::make_shared<MutexObject>() : MutexObject::Open(name));
    });
}

bool ReleaseMutex(Handle mutex) {
    return !CallMustFail("ReleaseMutex") &&
           OnObject<MutexObject>(mutex, [](MutexObject& object) { return object.Release(CurrentThread()); });
}

Handle MakeSemaphore(std::int32_t initialCount, std::int32_t maximumCount, const std::string& name) {
    return HandleOf("MakeSemaphore", [&] {
        if (initialCount < 0 || maximumCount <= 0 || initialCount > maximumCount) {
            SetLastError(Errors::InvalidParameter);
            return NoHandle;
        }
        return AddIfMade(name.empty() ? std::make_shared<SemaphoreObject>(initialCount, maximumCount)
                                      : SemaphoreObject::Open(initialCount, maximumCount, name));
    });
}

bool ReleaseSemaphore(Handle semaphore, std::int32_t count) {
    return !CallMustFail("ReleaseSemaphore") &&
           OnObject<SemaphoreObject>(semaphore,
                                     [count](SemaphoreObject& object) { return object.Release(count); });
}

WaitResult Wait(Handle handle, std::uint32_t timeout) {
    if (CallMustFail("Wait")) {
        return WaitResult::Failed;
    }
    std::array entries{WaitEntry{HandleTable::Instance().Find(handle)}};
    return entries[0].object ? WaitForObjects(entries, timeout).result : WaitResult::Failed;
}

WaitAnyResult WaitAny(std::span<const Handle> handles, std::uint32_t timeout) {
    if (CallMustFail("WaitAny")) {
        return {WaitResult::Failed, 0};
    }
    if (handles.empty() || handles.size() > MostObjectsPerWait) {
        SetLastError(Errors::InvalidParameter);
        return {WaitResult::Failed, 0};
    }
    std::array<WaitEntry, MostObjectsPerWait> entries;
    for (std::size_t i = 0; i < handles.size(); ++i) {
        entries[i].object = HandleTable::Instance().Find(handles[i]);
        if (!entries[i].object) {
            return {WaitResult::Failed, 0};
        }
    }
    return WaitForObjects(std::span(entries).first(handles.size()), timeout);
}

WaitResult SignalAndWait(Handle toSignal, Handle toWait, std::uint32_t timeout) {
    if (CallMustFail("SignalAndWait")) {
        return WaitResult::Failed;
    }
    const ObjectRef signalled = HandleTable::Instance().Find(toSignal);
    std::array entries{WaitEntry{signalled ? HandleTable::Instance().Find(toWait) : nullptr}};
    return entries[0].object ? WaitForObjects(entries, timeout, signalled.get()).result : WaitResult::Failed;
}

struct EmbeddedEvent::Impl {
    EventObject object;
};

EmbeddedEvent::EmbeddedEvent() = default;
EmbeddedEvent::~EmbeddedEvent() = default;

void EmbeddedEvent::Reset(const std::shared_ptr<CompletionSource>& source) {
    const DispatcherLock hold;
    impl_->object.Reset(source);
}

void EmbeddedEvent::Signal() {
    DispatcherLock hold;
    impl_->object.Signal(CurrentThread());
    CurrentClock().Preempt(hold);
}

bool EmbeddedEvent::Wait(std::uint32_t timeout) {
    // Its owner keeps it alive, so the reference counts nothing.
    std::array entries{WaitEntry{ObjectRef(ObjectRef(), &impl_->object)}};
    return WaitForObjects(entries, timeout).result == WaitResult::Signalled;
}

}  // namespace Varnholt::Platform
