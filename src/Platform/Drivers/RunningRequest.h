#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <thread>

#include "Platform/DeviceFiles.h"
#include "Platform/Usb/UsbDevice.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform::Drivers {

class OpenFile;

/// One request on an open file, from its start until its record says how it ended. Shared by the file while
/// it runs and by whoever starts it, cancels it or waits for it.
///
/// Three parties meet here: the thread that starts it, the thread that the device completes it on, and
/// threads that cancel it. `state` decides between them:
/// - the starter sets `Submitted` once the device has taken the transfer, the completion sets `Completed`.
///   Whoever comes second ends the request; so a completion inside `Submit` is ended by the starter, which
///   can then tell its caller.
/// - a canceller sets `CancelWanted`. If that is before `Submitted`, the device does not know the transfer
///   yet and the starter cancels it; otherwise the canceller does.
struct RunningRequest final : public Usb::TransferClient,
                              public std::enable_shared_from_this<RunningRequest> {
    static constexpr std::uint32_t Submitted = 1;
    static constexpr std::uint32_t Completed = 2;
    static constexpr std::uint32_t CancelWanted = 4;
    static constexpr std::uint32_t TimedOut = 8;  ///< the cancellation is the driver's own
    static constexpr std::uint16_t Undecided = 0x100;

    RunningRequest(std::shared_ptr<OpenFile> opened, Overlapped& startedOn)
        : file(std::move(opened)), record(startedOn) {
        transfer.client = this;
    }
    void TransferCompleted(Usb::Transfer& completed) noexcept override;

    const std::shared_ptr<OpenFile> file;
    Overlapped& record;  ///< its caller's, who may reuse it when the request has ended
    const std::thread::id starter = std::this_thread::get_id();
    std::uint64_t number = 0;  ///< grows with each request of the file
    Usb::Transfer transfer;
    std::atomic<std::uint32_t> state{0};
    /// Where the transfer goes once that is decided; the transfer itself is not looked into meanwhile.
    std::atomic<std::uint16_t> endpoint{Undecided};
    /// Milliseconds that a wait for the request lasts before the driver gives it up; 0: no limit.
    std::atomic<std::uint32_t> waitLimit{0};
    bool hasAlarm = false;   ///< an event, owned by the request, gives it up: it is waited for elsewhere
    bool isAwaited = false;  ///< guarded by the file's lock
    EmbeddedEvent ended;     ///< signalled if it is awaited
};

}  // namespace Varnholt::Platform::Drivers
