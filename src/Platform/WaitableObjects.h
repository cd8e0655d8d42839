#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>

#include "Platform/Handle.h"

namespace Varnholt::Platform {

/// Time-outs are milliseconds.
inline constexpr std::uint32_t Infinite = 0xFFFFFFFF;

/// The numbers are the Win32 wait results, because one operation of the USBIO library passes them on.
enum class WaitResult : std::uint32_t {
    Signalled = 0,
    Abandoned = 0x80,  ///< acquired a mutex whose owner ended without releasing it
    TimedOut = 0x102,
    Failed = 0xFFFFFFFF,  ///< not a waitable object, or the system refused; see `LastError`
};

/// The makers return `NoHandle` on failure with the reason in `LastError`. An empty name makes an unnamed
/// object; objects of one name and kind are one object for every process of the machine that may use it.

/// Unsignalled; the wait that it satisfies resets it.
Handle MakeAutoResetEvent();
bool SignalEvent(Handle event);

/// Not owned. Recursive: the owner must release it as often as it acquired it.
Handle MakeMutex(const std::string& name);
bool ReleaseMutex(Handle mutex);  ///< fails with `Errors::NotOwner` unless the caller owns it

Handle MakeSemaphore(std::int32_t initialCount, std::int32_t maximumCount, const std::string& name);
bool ReleaseSemaphore(Handle semaphore, std::int32_t count);  ///< `Errors::TooManyPosts` beyond the maximum

/// Waits for an event, mutex, semaphore or thread (signalled when it has ended).
WaitResult Wait(Handle object, std::uint32_t timeout);

struct WaitAnyResult {
    WaitResult result;
    std::size_t index;  ///< of the first satisfied object when signalled or abandoned
};
WaitAnyResult WaitAny(std::span<const Handle> objects, std::uint32_t timeout);

/// In one atomic step signals an event, releases a mutex or releases a semaphore by one, and waits on the
/// other object. `Failed` when `toSignal` cannot be signalled (then nothing was waited for).
WaitResult SignalAndWait(Handle toSignal, Handle toWait, std::uint32_t timeout);

/// A process-local recursive lock; no handle, no time-out. It takes no memory: neither making nor entering
/// one can fail.
class CriticalSection final {
  public:
    CriticalSection();
    ~CriticalSection();
    CriticalSection(const CriticalSection&) = delete;
    CriticalSection& operator=(const CriticalSection&) = delete;

    void Enter();
    void Leave();

    class Holder final {
      public:
        explicit Holder(CriticalSection& held) : section_(held) { section_.Enter(); }
        ~Holder() { section_.Leave(); }
        Holder(const Holder&) = delete;
        Holder& operator=(const Holder&) = delete;

      private:
        CriticalSection& section_;
    };

  private:
    struct Impl;
    Impl& Own();

    /// Holds the platform's `Impl`.
    static constexpr std::size_t ImplSize = 80;
    alignas(void*) std::byte storage_[ImplSize];
};

}  // namespace Varnholt::Platform
