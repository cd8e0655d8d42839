#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "DeviceDriver/Generic/EventListener.h"
#include "Platform/Handle.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// Watches the instrument's interrupt pipe on a thread of its own and turns what it sees into messages:
/// 20011 for interrupt data, 20010 once when the pipe stops delivering while nobody asked for an end. A read
/// that is refused, with any code, ends the thread as one does that brings nothing: a pipe that refuses one
/// refuses the next.
///
/// One owner starts and stops it; the accessors may be called from any thread, also from inside a message.
/// A message is delivered with no lock of the listener held, so a message that was under way when
/// `ClearListener` was called may still arrive: a receiver that must know when the last one is through
/// guards that with a lock of its own.
class InterruptListener final {
  public:
    explicit InterruptListener(const std::string& devicePath);
    /// Stops; lets nothing out.
    ~InterruptListener();
    InterruptListener(const InterruptListener&) = delete;
    InterruptListener& operator=(const InterruptListener&) = delete;

    /// The thread keeps the receiver alive while it delivers.
    void SetListener(std::shared_ptr<Generic::EventListener> receiver);
    void ClearListener();

    /// True once interrupt data have arrived.
    bool IsTouched() const;

    /// Returns when the thread has opened the pipe. `IOException` when the thread cannot be made or does not
    /// report within 2000 ms; it may then still run and is to be stopped. Harmless when it was started.
    void Start();
    /// Ends the thread within 11 s. A thread that does not end is ended by force; where the platform cannot,
    /// it is left to itself with everything it uses. Called from inside a message it asks for the end and
    /// does not wait. Harmless without a thread.
    void Stop();

    /// The thread's body, on the calling thread: opens the pipe and reads it until the end is requested or
    /// the pipe delivers nothing more. What goes wrong ends it and is kept to itself.
    void Listen();
    /// The message that follows from a read of so many bytes: 20011, or for 0 bytes, while the thread runs
    /// and nobody has asked for its end, 20010.
    void DispatchEvent(std::uint32_t count);

  private:
    class Watch;

    const std::shared_ptr<Watch> watch_;
    Platform::OwnedHandle thread_;  ///< of the owner's thread only
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
