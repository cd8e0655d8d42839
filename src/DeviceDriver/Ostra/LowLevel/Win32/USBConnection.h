#pragma once

#include <atomic>
#include <cstdint>
#include <string>
#include <vector>

#include "Platform/OverlappedRequest.h"
#include "Protocol/NativeDriver.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// One open pipe of the instrument's own kernel driver: 0 the device itself with its controls, 1 bulk data
/// from the instrument, 2 bulk data to it, 3 its interrupts.
///
/// One thread at a time transfers on a connection, one transfer at a time (strip reads bring requests of
/// their own); only `Close` may be called beside it. No transfer outlives the operation that started it: it
/// has completed, cancelled if need be, before the operation returns or throws. After `Close` every operation
/// fails with the platform's invalid-handle code.
///
/// Time-outs are milliseconds. The texts of failures end with " (Win32 Error (CODE) : MESSAGE)", CODE being
/// that of the call that failed.
class USBConnection final {
  public:
    /// `event`: the auto-reset event that transfers complete through, owned by the caller and alive as long
    /// as the connection; `NoHandle`: the connection makes its own.
    USBConnection(const std::string& devicePath, std::uint32_t pipeNumber, Platform::Handle event);
    ~USBConnection();
    USBConnection(const USBConnection&) = delete;
    USBConnection& operator=(const USBConnection&) = delete;

    /// Harmless when closed. On another thread than the one that transfers it ends the transfer.
    void Close() noexcept;

    /// One device control with `length` bytes of data in either direction; waits 2000 ms at most. Gives the
    /// bytes that the driver says it moved. `TimeoutException` or `IOException`; with `reportFailures` clear
    /// neither these nor the bytes.
    std::uint32_t PerformDeviceIOControl(const Protocol::NativeDriver::ControlBlock& block,
                                         std::uint32_t code, void* data, std::uint32_t length,
                                         bool reportFailures);

    /// Move exactly `length` bytes within the time-out plus 5000 ms, or throw: `IOException`, also when the
    /// time ran out; `TimeoutException` when the wait was abandoned.
    void Read(void* buffer, std::uint32_t length, std::uint32_t timeout);
    void Write(const void* buffer, std::uint32_t length, std::uint32_t timeout);

    /// Reads at most the vector's size, waiting without limit; gives the bytes read. 0 when the read was
    /// refused, with any code and not only for want of access, as nothing would end the wait; and when it
    /// gave nothing, also because someone else signalled the event. `IOException` when the wait fails.
    ///
    /// The start of a read resets the event. Who signals it to end the read, whether that has started or not,
    /// sets `endRequested` before.
    std::uint32_t Read(std::vector<std::uint8_t>& buffer, const std::atomic<bool>& endRequested);

    /// What a caller needs that keeps several requests outstanding on the pipe.
    Platform::Handle PipeHandle() const noexcept { return pipeHandle_; }
    Platform::Handle CompletionEvent() const noexcept {
        return sharedEvent_ ? sharedEvent_ : ownEvent_.load();
    }

    // The parts of the above.

    /// Opens the pipe, and makes an event where none is handed in; what was open is closed before.
    void OpenConnection(Platform::Handle event);
    /// The caller owns the handle. `IOException` "could not open pipe:" and the error's text.
    static Platform::Handle OpenPipe(const std::string& name);
    /// Waits for a transfer that was started, and checks it; `name` begins the text of a failure.
    static void CompleteOverlappedIO(Platform::OverlappedRequest& request, std::uint32_t expected,
                                     std::uint32_t timeout, const std::string& name);
    /// The text of this thread's last error, as failures append it.
    static std::string GetErrorText();

  private:
    const std::uint32_t pipeNumber_;
    Platform::Handle sharedEvent_ = Platform::NoHandle;
    // Atomic because `Close` may come from another thread; whoever takes a handle out closes it.
    std::atomic<Platform::Handle> pipeHandle_ = Platform::NoHandle;
    std::atomic<Platform::Handle> ownEvent_ = Platform::NoHandle;
    const std::string devicePath_;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
