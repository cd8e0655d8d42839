#include "DeviceDriver/Ostra/LowLevel/Win32/USBConnection.h"

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/WaitLimit.h"
#include "Platform/DeviceFiles.h"
#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using Platform::NoHandle;
using Platform::Operation;
using Platform::OverlappedRequest;
using Platform::WaitResult;

constexpr std::uint32_t ControlWaitLimit = 2000;
constexpr std::uint32_t TransferGrace = 5000;  ///< what a transfer gets beyond its time-out

std::string TextOf(Platform::ErrorCode code) {
    return " (Win32 Error (" + std::to_string(code) + ") : " + Platform::ErrorText(code) + ")";
}

}  // namespace

USBConnection::USBConnection(const std::string& path, std::uint32_t pipe, Platform::Handle event) try
    : pipeNumber_(pipe), devicePath_(path) {
    OpenConnection(event);
}
TRACED

USBConnection::~USBConnection() {
    Close();
}

void USBConnection::OpenConnection(Platform::Handle event) try {
    Close();
    sharedEvent_ = event == Platform::InvalidHandle() ? NoHandle : event;
    const std::string suffix = pipeNumber_ == Protocol::NativeDriver::ControlPipe
                                   ? std::string()
                                   : Protocol::NativeDriver::PipeSuffix + std::to_string(pipeNumber_);
    pipeHandle_ = OpenPipe(devicePath_ + suffix);
    if (sharedEvent_ != NoHandle) {
        return;
    }
    ownEvent_ = Platform::MakeAutoResetEvent();
    if (ownEvent_ == NoHandle) {
        Close();
        throw IOException("could not create pipe-event-handle", Here());
    }
}
TRACED

Platform::Handle USBConnection::OpenPipe(const std::string& name) try {
    const Platform::Handle opened = Platform::DeviceFiles().Open(name);
    if (opened == Platform::InvalidHandle()) {
        const Platform::ErrorCode error = Platform::LastError();
        throw IOException("could not open pipe:" + TextOf(error), Here(), error);
    }
    return opened;
}
TRACED

void USBConnection::Close() noexcept {
    // The pipe first: a transfer that this ends still signals the event.
    if (const Platform::Handle file = pipeHandle_.exchange(NoHandle); file != NoHandle) {
        Platform::DeviceFiles().CloseFile(file);
    }
    if (const Platform::Handle event = ownEvent_.exchange(NoHandle); event != NoHandle) {
        Platform::Close(event);
    }
}

std::uint32_t USBConnection::PerformDeviceIOControl(const Protocol::NativeDriver::ControlBlock& block,
                                                    std::uint32_t code, void* data, std::uint32_t length,
                                                    bool reportFailures) try {
    Platform::SleepMilliseconds(1);
    OverlappedRequest request(CompletionEvent());
    request.Start(pipeHandle_, Operation::Control(code, block, data, length));
    const WaitResult waited = Platform::Wait(request.CompletionEvent(), ControlWaitLimit);
    if (!reportFailures) {
        return 0;
    }
    if (waited != WaitResult::Signalled) {
        const Platform::ErrorCode error = Platform::LastError();
        throw TimeoutException("Device IO control failed " + TextOf(error), Here(), error);
    }
    std::uint32_t transferred = 0;
    if (!request.GetResult(transferred)) {
        const Platform::ErrorCode error = Platform::LastError();
        throw IOException("Device IO control failed: " + TextOf(error), Here(), error);
    }
    return transferred;
}
TRACED

void USBConnection::Read(void* buffer, std::uint32_t length, std::uint32_t timeout) try {
    OverlappedRequest request(CompletionEvent());
    request.Start(pipeHandle_, Operation::Read(buffer, length));
    CompleteOverlappedIO(request, length, timeout, "read");
}
TRACED

void USBConnection::Write(const void* buffer, std::uint32_t length, std::uint32_t timeout) try {
    OverlappedRequest request(CompletionEvent());
    request.Start(pipeHandle_, Operation::Write(buffer, length));
    CompleteOverlappedIO(request, length, timeout, "write");
}
TRACED

std::uint32_t USBConnection::Read(std::vector<std::uint8_t>& buffer,
                                  const std::atomic<bool>& endRequested) try {
    OverlappedRequest request(CompletionEvent());
    request.Start(pipeHandle_, Operation::Read(buffer.data(), static_cast<std::uint32_t>(buffer.size())));
    if (!request.IsRunning()) {
        return 0;  // nothing would ever end the wait: not only when the access was denied
    }
    if (!endRequested &&
        Platform::Wait(request.CompletionEvent(), Platform::Infinite) != WaitResult::Signalled) {
        throw IOException("wait failed", Here());
    }
    std::uint32_t transferred = 0;
    if (!request.GetResult(transferred) && request.IsRunning()) {
        // Data that arrive while the read is being cancelled count.
        transferred = request.CancelAndWait();
    }
    return transferred;
}
TRACED

/// Leaves a transfer that still runs to the request, whose end cancels it and waits for that; by then the
/// text of the failure is made.
void USBConnection::CompleteOverlappedIO(OverlappedRequest& request, std::uint32_t expected,
                                         std::uint32_t timeout, const std::string& name) try {
    if (Platform::Wait(request.CompletionEvent(), WaitLimit(timeout, TransferGrace)) ==
        WaitResult::Abandoned) {
        const Platform::ErrorCode error = Platform::LastError();
        throw TimeoutException(name + " data failed (wait abandoned)" + TextOf(error), Here(), error);
    }
    std::uint32_t transferred = 0;
    if (!request.GetResult(transferred)) {
        const Platform::ErrorCode error = Platform::LastError();
        throw IOException(name + " data failed" + TextOf(error), Here(), error);
    }
    if (transferred != expected) {
        throw IOException(name + " data failed (Not enough data)", Here(), Shortfall{transferred, expected});
    }
}
TRACED

std::string USBConnection::GetErrorText() try { return TextOf(Platform::LastError()); }
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
