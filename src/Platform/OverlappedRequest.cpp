#include "Platform/OverlappedRequest.h"

namespace Varnholt::Platform {

OverlappedRequest::OverlappedRequest(Handle completionEvent) {
    record.event = completionEvent;
}

OverlappedRequest::~OverlappedRequest() {
    CancelAndWait();
}

bool OverlappedRequest::StartRead(Handle readFrom, void* buffer, std::uint32_t length) {
    CancelAndWait();
    return Started(readFrom, DeviceFiles().StartRead(readFrom, buffer, length, record));
}

bool OverlappedRequest::StartWrite(Handle writeTo, const void* buffer, std::uint32_t length) {
    CancelAndWait();
    return Started(writeTo, DeviceFiles().StartWrite(writeTo, buffer, length, record));
}

bool OverlappedRequest::StartControl(Handle device, std::uint32_t code, const void* input,
                                     std::uint32_t inputSize, void* output, std::uint32_t outputSize) {
    CancelAndWait();
    return Started(device,
                   DeviceFiles().StartControl(device, code, input, inputSize, output, outputSize, record));
}

bool OverlappedRequest::Started(Handle startedOn, bool completedAtOnce) {
    file = startedOn;
    if (completedAtOnce) {
        state = State::Running;  // its result is still to be fetched
        return true;
    }
    startError = LastError();
    state = startError == Errors::IoPending ? State::Running : State::FailedToStart;
    return false;
}

bool OverlappedRequest::GetResult(std::uint32_t& transferred) {
    return FetchResult(transferred, false);
}

bool OverlappedRequest::AwaitResult(std::uint32_t& transferred) {
    return FetchResult(transferred, true);
}

bool OverlappedRequest::FetchResult(std::uint32_t& transferred, bool wait) {
    if (state == State::FailedToStart || state == State::Idle) {
        transferred = 0;
        SetLastError(state == State::Idle ? Errors::InvalidParameter : startError);
        return false;
    }
    const bool succeeded = DeviceFiles().GetResult(file, record, transferred, wait);
    if (succeeded) {
        state = State::Completed;
        return true;
    }
    const ErrorCode code = LastError();
    if (code == Errors::IoIncomplete) {
        transferred = 0;
    } else {
        state = State::Completed;
    }
    SetLastError(code);
    return false;
}

std::uint32_t OverlappedRequest::CancelAndWait() {
    if (state != State::Running) {
        return 0;
    }
    const ErrorCode before = LastError();
    std::uint32_t transferred = 0;
    if (!DeviceFiles().GetResult(file, record, transferred, false) && LastError() == Errors::IoIncomplete) {
        DeviceFiles().CancelTransfers(file);
        DeviceFiles().GetResult(file, record, transferred, true);
    }
    state = State::Completed;
    SetLastError(before);
    return transferred;
}

}  // namespace Varnholt::Platform
