#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "DeviceDriver/Generic/EventListener.h"
#include "Platform/Handle.h"
#include "UsbIo/CUsbIoPipe.h"
#include "Utilities/Tools/SmartPointer.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// Watches the instrument's interrupt pipe on a thread of its own and turns what it sees into messages:
/// 20011 for interrupt data, 20010 once when the pipe stops delivering while nobody asked for an end. A read
/// that is refused, with any code but that of a time-out, ends the thread.
///
/// One owner sets the pipe, starts and stops it; the accessors may be called from any thread, also from
/// inside a message.
class InterruptListener_Win64 final {
  public:
    /// The path is not used: the owner hands a bound pipe over.
    explicit InterruptListener_Win64(const std::string& devicePath);
    /// Stops; lets nothing out.
    ~InterruptListener_Win64();
    InterruptListener_Win64(const InterruptListener_Win64&) = delete;
    InterruptListener_Win64& operator=(const InterruptListener_Win64&) = delete;

    /// Not owned. Both return after the end of a message that is under way on the listener's thread, so that
    /// the receiver they take away gets no further one.
    void SetListener(Generic::EventListener* receiver);
    void ClearListener();

    /// A pipe bound to the interrupt endpoint; before `Start`.
    void SetPipe(const Varnholt::Utilities::Tools::SmartPointer<UsbIo::CUsbIoPipe>& boundPipe);

    /// True once interrupt data have arrived.
    bool IsTouched() const;

    /// Returns when the thread runs. `IOException` when it cannot be made or does not report within 2000 ms;
    /// it may then still run and is to be stopped. Harmless when it was started.
    void Start();
    /// Ends the thread: at once where it waits for the instrument, within 11 s where a receiver or the driver
    /// holds it up. A thread that does not end in that time is ended by force; where the platform cannot, its
    /// pipe is closed and it is left to itself with everything it uses. Called from inside a message it asks
    /// for the end and does not wait. Harmless without a thread.
    void Stop();

    /// The thread's body, on the calling thread, once the pipe is set: reads until the end is requested or a
    /// read fails.
    void Listen();
    /// The message that follows from a read: 20011 for a count that is not 0; for 0, while the thread runs
    /// and nobody has asked for its end, 20010.
    void DispatchEvent(std::uint32_t count);

  private:
    class Watch;

    const std::shared_ptr<Watch> watch_;
    Platform::OwnedHandle thread_;  ///< of the owner's thread only
    Varnholt::Utilities::Tools::SmartPointer<UsbIo::CUsbIoPipe> pipe_;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
