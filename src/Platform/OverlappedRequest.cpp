#include "Platform/OverlappedRequest.h"

namespace Varnholt::Platform {

OverlappedRequest::OverlappedRequest(Handle completionEvent) {
    record_.event = completionEvent;
}

OverlappedRequest::~OverlappedRequest() {
    CancelAndWait();
}

bool OverlappedRequest::Start(Handle startedOn, const Operation& operation) {
    CancelAndWait();
    file_ = startedOn;
    if (DeviceFiles().Start(file_, operation, record_)) {
        state_ = State::Running;  // its result is still to be fetched
        return true;
    }
    startError_ = LastError();
    state_ = startError_ == Errors::IoPending ? State::Running : State::FailedToStart;
    return false;
}

bool OverlappedRequest::GetResult(std::uint32_t& transferred, bool wait) {
    if (state_ == State::FailedToStart || state_ == State::Idle) {
        transferred = 0;
        SetLastError(state_ == State::Idle ? Errors::InvalidParameter : startError_);
        return false;
    }
    const bool succeeded = DeviceFiles().GetResult(file_, record_, transferred, wait);
    if (!succeeded && LastError() == Errors::IoIncomplete) {
        transferred = 0;
    } else {
        state_ = State::Completed;
    }
    return succeeded;
}

std::uint32_t OverlappedRequest::CancelAndWait() {
    if (state_ != State::Running) {
        return 0;
    }
    const ErrorCode before = LastError();
    std::uint32_t transferred = 0;
    if (!DeviceFiles().GetResult(file_, record_, transferred, false) && LastError() == Errors::IoIncomplete) {
        DeviceFiles().CancelTransfers(file_);
        DeviceFiles().GetResult(file_, record_, transferred, true);
    }
    state_ = State::Completed;
    SetLastError(before);
    return transferred;
}

}  // namespace Varnholt::Platform
