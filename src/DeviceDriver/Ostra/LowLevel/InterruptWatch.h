#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <thread>

#include "DeviceDriver/Generic/EventListener.h"
#include "Platform/Handle.h"
#include "Platform/WaitableObjects.h"
#include "Utilities/Exceptions/SourceLocation.h"
#include "Utilities/Multithreading/Mutex.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// What an interrupt listener's thread works on, and how that thread is started and ended; a transport's own
/// watch says what is read and from where. The thread and the listener own it together, so that a thread that
/// could not be ended finds its things in place however late it comes back.
class InterruptWatch : public std::enable_shared_from_this<InterruptWatch> {
  public:
    InterruptWatch() = default;
    virtual ~InterruptWatch() = default;
    InterruptWatch(const InterruptWatch&) = delete;
    InterruptWatch& operator=(const InterruptWatch&) = delete;

    /// False when the system had no events for it.
    bool HasEvents() const;

    /// The thread keeps the receiver alive while it delivers.
    void SetReceiver(std::shared_ptr<Generic::EventListener> receiver);
    /// True once interrupt data have arrived.
    bool IsTouched() const { return touched_; }

    /// Starts the thread where there is none, and returns when it has reported. `IOException` of the caller
    /// when it cannot be made or does not report within 2000 ms; it may then still run and is to be ended.
    void Start(Platform::OwnedHandle& thread, const Varnholt::Utilities::Exceptions::SourceLocation& caller =
                                                  Varnholt::Utilities::Exceptions::SourceLocation::current());
    /// Ends the thread within 11 s, by force where it does not end, and lets go of it; from the thread
    /// itself, asks for the end only. False when not even force has helped: the thread is left to itself
    /// then.
    bool End(Platform::OwnedHandle& thread);

  protected:
    /// The thread's work, which must end once that is requested. Whatever it throws ends the thread.
    virtual void Listen() = 0;
    /// Called by who ends the thread when it does not: its read may hang in the driver, which the end of the
    /// pipe is the end of.
    virtual void ClosePipe() = 0;

    void ReportStart();
    /// Delivers the message that follows from a read of so many bytes; nothing when an end was requested and
    /// nothing was read.
    void DispatchEvent(std::uint32_t count);
    /// Signalled when the end is requested, to end a read that waits.
    Platform::Handle Wake() const { return wake_.Get(); }
    const std::atomic<bool>& EndRequested() const { return endRequested_; }
    /// The thread runs no further instruction; it may hold locks of the derived class for ever.
    bool WasEndedByForce() const { return endedByForce_; }

    /// Guards what the derived class shares between threads, too; nobody is called with it held.
    Varnholt::Utilities::Multithreading::Mutex lock_{""};

  private:
    enum class State { Running, StopRequested, Ended };

    static std::uint32_t ThreadEntry(void* argument);
    void Run();
    void RequestStop();
    bool EndByForce(Platform::Handle thread);

    const Platform::OwnedHandle started_{Platform::MakeAutoResetEvent()};
    const Platform::OwnedHandle wake_{Platform::MakeAutoResetEvent()};
    std::atomic<bool> endRequested_ = false;
    // Written under `lock_`:
    std::atomic<State> state_ = State::Ended;
    std::atomic<bool> touched_ = false;
    std::atomic<bool> endedByForce_ = false;
    std::atomic<std::thread::id> threadId_{};
    std::shared_ptr<Generic::EventListener> listener_;  ///< and read
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
