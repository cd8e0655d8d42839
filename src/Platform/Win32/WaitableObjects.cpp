#include "Platform/WaitableObjects.h"

#include <algorithm>
#include <memory>

#include "Platform/CallFilter.h"
#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

static_assert(static_cast<DWORD>(WaitResult::Signalled) == WAIT_OBJECT_0);
static_assert(static_cast<DWORD>(WaitResult::Abandoned) == WAIT_ABANDONED_0);
static_assert(static_cast<DWORD>(WaitResult::TimedOut) == WAIT_TIMEOUT);
static_assert(static_cast<DWORD>(WaitResult::Failed) == WAIT_FAILED);
static_assert(Infinite == INFINITE);

/// The value of a failed open also stands for the current process, which can be waited for: that is never
/// meant.
bool Refused(Handle handle) {
    if (handle == InvalidHandle()) {
        SetLastError(Errors::InvalidHandle);
        return true;
    }
    return false;
}

const char* NameOrNull(const std::string& name) {
    return name.empty() ? nullptr : name.c_str();
}

}  // namespace

// The system's constant is an integer cast to a pointer, as is every handle.
Handle InvalidHandle() {
    return reinterpret_cast<Handle>(static_cast<std::intptr_t>(-1));
}

bool Close(Handle handle) {
    return !Refused(handle) && ::CloseHandle(handle) != 0;
}

Handle MakeAutoResetEvent() {
    return CallMustFail("MakeAutoResetEvent") ? NoHandle : ::CreateEventA(nullptr, FALSE, FALSE, nullptr);
}

bool SignalEvent(Handle event) {
    return !CallMustFail("SignalEvent") && ::SetEvent(event) != 0;
}

void ResetEvent(Handle event, const std::shared_ptr<CompletionSource>& /*source*/) {
    ::ResetEvent(event);
}

Handle MakeMutex(const std::string& name) {
    return CallMustFail("MakeMutex") ? NoHandle : ::CreateMutexA(nullptr, FALSE, NameOrNull(name));
}

bool ReleaseMutex(Handle mutex) {
    return !CallMustFail("ReleaseMutex") && ::ReleaseMutex(mutex) != 0;
}

Handle MakeSemaphore(std::int32_t initialCount, std::int32_t maximumCount, const std::string& name) {
    return CallMustFail("MakeSemaphore")
               ? NoHandle
               : ::CreateSemaphoreA(nullptr, initialCount, maximumCount, NameOrNull(name));
}

bool ReleaseSemaphore(Handle semaphore, std::int32_t count) {
    return !CallMustFail("ReleaseSemaphore") && ::ReleaseSemaphore(semaphore, count, nullptr) != 0;
}

WaitResult Wait(Handle object, std::uint32_t timeout) {
    if (CallMustFail("Wait") || Refused(object)) {
        return WaitResult::Failed;
    }
    return static_cast<WaitResult>(::WaitForSingleObject(object, timeout));
}

WaitAnyResult WaitAny(std::span<const Handle> objects, std::uint32_t timeout) {
    if (CallMustFail("WaitAny") || std::ranges::any_of(objects, Refused)) {
        return {WaitResult::Failed, 0};
    }
    const auto count = static_cast<DWORD>(objects.size());
    const DWORD outcome = ::WaitForMultipleObjects(count, objects.data(), FALSE, timeout);
    if (outcome < WAIT_OBJECT_0 + count) {
        return {WaitResult::Signalled, outcome - WAIT_OBJECT_0};
    }
    if (outcome >= WAIT_ABANDONED_0 && outcome < WAIT_ABANDONED_0 + count) {
        return {WaitResult::Abandoned, outcome - WAIT_ABANDONED_0};
    }
    return {static_cast<WaitResult>(outcome), 0};
}

WaitResult SignalAndWait(Handle toSignal, Handle toWait, std::uint32_t timeout) {
    if (CallMustFail("SignalAndWait") || Refused(toSignal) || Refused(toWait)) {
        return WaitResult::Failed;
    }
    return static_cast<WaitResult>(::SignalObjectAndWait(toSignal, toWait, timeout, FALSE));
}

struct EmbeddedEvent::Impl {
    OwnedHandle handle{::CreateEventA(nullptr, FALSE, FALSE, nullptr)};
};

EmbeddedEvent::EmbeddedEvent() = default;
EmbeddedEvent::~EmbeddedEvent() = default;

void EmbeddedEvent::Reset(const std::shared_ptr<CompletionSource>& /*source*/) {
    ::ResetEvent(impl_->handle.Get());
}

void EmbeddedEvent::Signal() {
    ::SetEvent(impl_->handle.Get());
}

bool EmbeddedEvent::Wait(std::uint32_t timeout) {
    return ::WaitForSingleObject(impl_->handle.Get(), timeout) == WAIT_OBJECT_0;
}

struct RecursiveMutex::Impl {
    Impl() { ::InitializeCriticalSection(&section); }
    ~Impl() { ::DeleteCriticalSection(&section); }
    Impl(const Impl&) = delete;
    Impl& operator=(const Impl&) = delete;

    CRITICAL_SECTION section{};
};

RecursiveMutex::RecursiveMutex() = default;
RecursiveMutex::~RecursiveMutex() = default;

void RecursiveMutex::lock() {
    ::EnterCriticalSection(&impl_->section);
}

void RecursiveMutex::unlock() {
    ::LeaveCriticalSection(&impl_->section);
}

}  // namespace Varnholt::Platform
