#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <span>

#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/DriverFile.h"
#include "Platform/Drivers/RunningRequest.h"
#include "Platform/Drivers/Waiter.h"

namespace Varnholt::Platform::Drivers {

/// What is asked for by the start of a request.
struct Operation {
    enum class Kind { Read, Write, Control };
    Kind kind;
    std::uint32_t code = 0;               ///< control
    std::span<const std::uint8_t> input;  ///< control
    std::uint8_t* data = nullptr;         ///< what is read into, written from, or a control's output
    std::uint32_t length = 0;
};

/// An open file and the requests that run on it: overlapped semantics, cancellation and closing, for
/// whichever driver stands behind the file. Serves one handle after the other; `generation` tells them apart,
/// so that a stale handle is refused. The object itself lives as long as the file system.
///
/// The lock is held for a few instructions only, and never while a platform call, a driver or the USB device
/// is called: a completion may arrive inside any of these.
class OpenFile final {
  public:
    explicit OpenFile(std::uint32_t place) : index(place) {}
    ~OpenFile();
    OpenFile(const OpenFile&) = delete;
    OpenFile& operator=(const OpenFile&) = delete;

    /// Generations are counted in this many bits.
    static constexpr std::uint32_t GenerationBits = 19;

    const std::uint32_t index;

    /// Takes the file into use and gives its generation. The caller picks a file that is free.
    std::uint32_t Open(std::unique_ptr<DriverFile> opened);
    /// Ends all requests, waits until they have completed, and hands the driver's side back; the file stays
    /// occupied until `Free`. Null if the handle is stale.
    std::unique_ptr<DriverFile> Close(std::uint32_t openedAs);
    void Free();
    bool IsFree() const;
    std::uint32_t Generation() const;

    /// As the starts of `DeviceFileSystem`.
    bool Start(std::uint32_t openedAs, const Operation& operation, Overlapped& record);

    /// Waits until the request on `record` has completed. False if the handle is stale or no such request
    /// runs.
    bool WaitFor(std::uint32_t openedAs, const Overlapped& record);

    /// Asks for the end of what the calling thread has started. False if the handle is stale.
    bool CancelOwn(std::uint32_t openedAs);
    /// Asks for the end of what runs on an endpoint, if the file is one of `device`.
    void CancelEndpoint(const SharedDevice& device, std::uint8_t endpoint);

    /// For `RunningRequest`: the device has completed the request's transfer.
    void Ended(RunningRequest& request);

  private:
    enum class Use { Free, Open, Closing, Closed };

    RunningRequest* Begin(std::uint32_t openedAs, Overlapped& record, ErrorCode& error);
    ErrorCode Finish(RunningRequest& request);
    void Retire(RunningRequest& request);
    void CancelAfterSubmit(RunningRequest& request);
    void LimitTime(RunningRequest& request);
    void GiveUp(std::uint64_t number);
    template <class Matches>
    void Cancel(Matches matches, std::uint32_t reason = RunningRequest::CancelWanted);
    void Pin(RunningRequest& request);
    void Unpin(RunningRequest& request);
    void Recycle(RunningRequest& request);
    void Equip(Waiter& waiter);
    void Enlist(Waiter& waiter);
    void Await(Waiter& waiter);
    void AwaitIdle();
    Waiter* TakeReleased();
    bool IsIdle() const { return running_ == nullptr && pinned_ == 0; }

    mutable std::mutex lock_;  ///< guards what follows; no other lock is taken while it is held
    Use use_ = Use::Free;
    std::uint32_t generation_ = 0;
    /// Set and taken only while no request is on the list: a request on the list may use it without the lock.
    std::unique_ptr<DriverFile> driver_;
    RunningRequest* running_ = nullptr;
    RunningRequest* spare_ = nullptr;
    std::uint32_t pinned_ = 0;  ///< requests with `pins`
    std::uint64_t lastNumber_ = 0;
    Waiter* waiters_ = nullptr;
    OwnedHandle spareEvent_;
};

}  // namespace Varnholt::Platform::Drivers
