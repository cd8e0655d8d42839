#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>

#include "Platform/CompletionSource.h"
#include "Platform/Handle.h"
#include "Platform/InPlace.h"

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
/// Takes a signal back. Where `source` is given, the next one comes from there: who waits for the event alone
/// handles the source's events meanwhile. Nothing happens where it is no event.
void ResetEvent(Handle event, const std::shared_ptr<CompletionSource>& source = nullptr);

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

/// An auto-reset event inside its owner: no handle. Neither making, signalling nor waiting takes memory.
class EmbeddedEvent final {
  public:
    EmbeddedEvent();
    ~EmbeddedEvent();
    EmbeddedEvent(const EmbeddedEvent&) = delete;
    EmbeddedEvent& operator=(const EmbeddedEvent&) = delete;

    /// As `ResetEvent`.
    void Reset(const std::shared_ptr<CompletionSource>& source);
    void Signal();
    /// False after `timeout` milliseconds without a signal.
    bool Wait(std::uint32_t timeout);

  private:
    struct Impl;
    InPlace<Impl, 80> impl_;
};

/// A process-local recursive lock; no handle, no time-out. It takes no memory: neither making nor locking
/// one can fail.
class RecursiveMutex final {
  public:
    RecursiveMutex();
    ~RecursiveMutex();
    RecursiveMutex(const RecursiveMutex&) = delete;
    RecursiveMutex& operator=(const RecursiveMutex&) = delete;

    // As the standard library names them, for its lock holders.
    void lock();
    void unlock();

  private:
    struct Impl;
    InPlace<Impl, 104> impl_;
};

}  // namespace Varnholt::Platform
