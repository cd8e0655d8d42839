#pragma once

#include <atomic>
#include <cstdint>

#include "Platform/Handle.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform::Drivers {

struct RunningRequest;

/// A thread that waits for the end of one request of a file, or of all. It lives on that thread's stack and
/// stands on the file's list; whoever takes it off the list releases it and does not touch it afterwards. The
/// wait is on an event of its own: the request's event is its caller's, and others may take its signal.
struct Waiter {
    const RunningRequest* request = nullptr;  ///< null: until the file is idle
    std::uint64_t number = 0;                 ///< of the request
    std::uint32_t limit = Infinite;           ///< ms, after which the driver gives the request up
    Waiter* next = nullptr;

    /// Gives it an event, `spare` if that is one. Without the file's lock, before it is enlisted.
    void Equip(OwnedHandle spare) noexcept;
    /// False if it has not been released within `timeout` milliseconds.
    bool AwaitFor(std::uint32_t timeout) noexcept;
    /// Returns when it has been released, with the event if that can be used again.
    OwnedHandle Await() noexcept;

    /// Releases a chain of waiters. Without the file's lock.
    static void Release(Waiter* first) noexcept;

  private:
    OwnedHandle event_;  ///< none if it cannot be made: then `released` is polled
    bool signalled_ = false;
    std::atomic<bool> released_{false};
};

}  // namespace Varnholt::Platform::Drivers
