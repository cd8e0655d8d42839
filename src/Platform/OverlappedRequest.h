#pragma once

#include <cstdint>

#include "Platform/DeviceFiles.h"

namespace Varnholt::Platform {

/// One overlapped operation with its claim on the caller's buffer. Success, pending, failure and abort end in
/// one place: the object does not die, and does not start anew, before its transfer has completed.
///
/// Used by one thread (cancelling reaches only the transfers of the thread that started them).
class OverlappedRequest final {
  public:
    /// `completionEvent` is an auto-reset event that outlives the request; several requests may share one.
    explicit OverlappedRequest(Handle completionEvent);
    /// Ends a transfer that still runs and waits for its completion.
    ~OverlappedRequest();
    OverlappedRequest(const OverlappedRequest&) = delete;
    OverlappedRequest& operator=(const OverlappedRequest&) = delete;

    /// As that of `DeviceFileSystem`. The buffer must outlive the request or its completion.
    bool Start(Handle file, const Operation& operation);

    /// Result of the last start; after a start that failed: that failure again. `wait` waits for the
    /// completion, as long as the file's driver lets it last.
    bool GetResult(std::uint32_t& transferred, bool wait = false);

    /// Cancels the transfer if it still runs, waits until it has completed, and gives the bytes it moved.
    /// `LastError` is left as it was.
    std::uint32_t CancelAndWait();

    bool IsRunning() const { return state_ == State::Running; }
    Handle CompletionEvent() const { return record_.event; }

  private:
    enum class State { Idle, Running, Completed, FailedToStart };

    Overlapped record_;
    Handle file_ = NoHandle;
    State state_ = State::Idle;
    ErrorCode startError_ = Errors::Success;
};

}  // namespace Varnholt::Platform
