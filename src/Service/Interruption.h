#pragma once

#include <atomic>
#include <cstdint>
#include <functional>

#include "Platform/Handle.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Service {

/// The user's wish to end: Ctrl-C, or a signal. `Request` may be called from any thread, the rest from the
/// thread that runs the command.
class Interruption final {
  public:
    Interruption() = default;
    Interruption(const Interruption&) = delete;
    Interruption& operator=(const Interruption&) = delete;

    void Request();
    bool IsRequested() const { return requested_.load(); }
    /// What was asked to end has ended: what comes next goes on until the next request.
    void Withdraw();

    /// Waits; false at once when the end is wanted.
    bool Sleep(std::uint32_t milliseconds) const;
    /// Throws `Failure` with `FailureKind::Interrupted`.
    void ThrowIfRequested() const;

    /// What a request does beside being noted: called on the requester's thread, once for each request.
    /// Empty: nothing.
    void SetAction(std::function<void()> whenRequested);

    /// For its life a request is only noted: around what must not be cut off in the middle, such as a write
    /// into the EEPROM, which then looks between its steps.
    class Deferral final {
      public:
        explicit Deferral(Interruption& deferred) : interruption_(deferred) { ++interruption_.deferrals_; }
        ~Deferral() { --interruption_.deferrals_; }
        Deferral(const Deferral&) = delete;
        Deferral& operator=(const Deferral&) = delete;

      private:
        Interruption& interruption_;
    };

  private:
    std::atomic<bool> requested_{false};
    std::atomic<int> deferrals_{0};
    const Platform::OwnedHandle event_{Platform::MakeAutoResetEvent()};
    Platform::RecursiveMutex section_;  ///< guards `action_`
    std::function<void()> action_;
};

}  // namespace Varnholt::Service
