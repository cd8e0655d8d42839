#pragma once

#include <atomic>
#include <cstdint>
#include <thread>

#include "Platform/DeviceFiles.h"
#include "Platform/EventScheduler.h"
#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Drivers {

class OpenFile;

/// One request on an open file, from its start until its record says how it ended. Its USB transfer and the
/// object are used again by later requests of the file.
///
/// Three parties meet here: the thread that starts it, the thread that the device completes it on, and
/// threads that cancel it. `state` decides between them:
/// - the starter sets `Submitted` once the device has taken the transfer, the completion sets `Completed`.
///   Whoever comes second ends the request; so a completion inside `Submit` is ended by the starter, which
///   can then tell its caller.
/// - a canceller sets `CancelWanted`. If that is before `Submitted`, the device does not know the transfer
/// yet
///   and the starter cancels it; otherwise the canceller does.
struct RunningRequest final : public Usb::TransferClient {
    static constexpr std::uint32_t Submitted = 1;
    static constexpr std::uint32_t Completed = 2;
    static constexpr std::uint32_t CancelWanted = 4;
    static constexpr std::uint32_t TimedOut = 8;  ///< the cancellation is the driver's own
    static constexpr std::uint16_t Undecided = 0x100;

    explicit RunningRequest(OpenFile& owner) : file(owner) { transfer.client = this; }
    void TransferCompleted(Usb::Transfer& completed) noexcept override;

    OpenFile& file;
    Usb::Transfer transfer;
    Overlapped* record = nullptr;
    std::thread::id starter;
    std::atomic<std::uint32_t> state{0};
    /// Where the transfer goes once that is decided; the transfer itself is not looked into meanwhile.
    std::atomic<std::uint16_t> endpoint{Undecided};
    /// Milliseconds that a wait for the request lasts before the driver gives it up; 0: no limit.
    std::atomic<std::uint32_t> waitLimit{0};
    /// Gives up a request that is waited for elsewhere; 0: none.
    EventScheduler::EventId alarm = 0;

    // Guarded by the file's lock.
    std::uint64_t number = 0;  ///< grows with each request of the file
    std::uint32_t pins = 0;    ///< cancellers that may still touch the transfer
    bool ended = false;        ///< off the list of running requests; free once nobody pins it
    RunningRequest* next = nullptr;
    RunningRequest* previous = nullptr;
};

}  // namespace Varnholt::Platform::Drivers
