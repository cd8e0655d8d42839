#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <vector>

#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/DriverFile.h"
#include "Platform/Drivers/RunningRequest.h"

namespace Varnholt::Platform::Drivers {

/// An open file and the requests that run on it: overlapped semantics, cancellation and closing, for
/// whichever driver stands behind the file.
///
/// The lock is held for a few instructions only, and never while a platform call, a driver or the USB device
/// is called: a completion may arrive inside any of these.
class OpenFile final : public std::enable_shared_from_this<OpenFile> {
  public:
    explicit OpenFile(std::unique_ptr<DriverFile> opened) : driver_(std::move(opened)) {}
    OpenFile(const OpenFile&) = delete;
    OpenFile& operator=(const OpenFile&) = delete;

    /// Ends all requests, waits until they have completed, and hands the driver's side back. Null if that has
    /// happened already.
    std::unique_ptr<DriverFile> Close();

    /// As that of `DeviceFileSystem`.
    bool Start(const Operation& operation, Overlapped& record);
    /// Waits until the request on `record` has completed. False if no such request runs.
    bool WaitFor(const Overlapped& record);

    /// Asks for the end of what the calling thread has started.
    void CancelOwn();
    /// Asks for the end of what runs on an endpoint, if the file is one of `device`.
    void CancelEndpoint(const SharedDevice& device, std::uint8_t endpoint);

    /// For `RunningRequest`: the device has completed the request's transfer, and the starter has gone.
    ErrorCode Finish(RunningRequest& request);

  private:
    std::shared_ptr<RunningRequest> Begin(Overlapped& record, ErrorCode& error);
    void Retire(RunningRequest& request);
    void CancelAfterSubmit(RunningRequest& request);
    void LimitTime(RunningRequest& request);
    void GiveUp(const RunningRequest& request);
    template <class Matches>
    void Cancel(Matches matches, std::uint32_t reason = RunningRequest::CancelWanted);
    template <class Change>
    void Leave(Change change);
    std::shared_ptr<RunningRequest> FindAwaited(const Overlapped& record);
    bool IsIdle() const { return running_.empty() && cancelling_ == 0; }

    mutable std::mutex lock_;  ///< guards what follows; no other lock is taken while it is held
    bool closing_ = false;     ///< nothing starts any more
    /// Stays until the file is idle for good: a running request and a canceller may use it without the lock.
    std::unique_ptr<DriverFile> driver_;
    std::vector<std::shared_ptr<RunningRequest>> running_;
    std::uint32_t cancelling_ = 0;  ///< threads that are about to ask the device for the end of a transfer
    std::uint64_t lastNumber_ = 0;

    EmbeddedEvent idle_;  ///< signalled when the last of them is through while the file is being closed
};

}  // namespace Varnholt::Platform::Drivers
