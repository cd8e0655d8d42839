#include "Platform/ErrorCodes.h"

#include <utility>

#include "Platform/LookUp.h"

namespace Varnholt::Platform {
namespace {

thread_local ErrorCode lastError = Errors::Success;

constexpr std::pair<ErrorCode, const char*> Messages[] = {
    {Errors::Success, "The operation completed successfully."},
    {Errors::FileNotFound, "The system cannot find the file specified."},
    {Errors::PathNotFound, "The system cannot find the path specified."},
    {Errors::AccessDenied, "Access is denied."},
    {Errors::InvalidHandle, "The handle is invalid."},
    {Errors::NotEnoughMemory, "Not enough memory is available to process this command."},
    {Errors::InvalidData, "The data is invalid."},
    {Errors::NotReady, "The device is not ready."},
    {Errors::GeneralFailure, "A device attached to the system is not functioning."},
    {Errors::NotSupported, "The request is not supported."},
    {Errors::InvalidParameter, "The parameter is incorrect."},
    {Errors::CallNotImplemented, "This function is not supported on this system."},
    {Errors::SemaphoreTimeout, "The time-out period has expired."},
    {Errors::InsufficientBuffer, "The data area passed to a system call is too small."},
    {Errors::ModuleNotFound, "The specified module could not be found."},
    {Errors::ProcedureNotFound, "The specified procedure could not be found."},
    {Errors::Busy, "The requested resource is in use."},
    {Errors::NoMoreItems, "No more data is available."},
    {Errors::NotOwner, "Attempt to release mutex not owned by caller."},
    {Errors::TooManyPosts, "Too many posts were made to a semaphore."},
    {Errors::OperationAborted,
     "The I/O operation has been aborted because of either a thread exit or an application request."},
    {Errors::IoIncomplete, "Overlapped I/O event is not in a signaled state."},
    {Errors::IoPending, "Overlapped I/O operation is in progress."},
    {Errors::DeviceNotConnected, "The device is not connected."},
    {Errors::NoSystemResources, "Insufficient system resources exist to complete the requested service."},
};

}  // namespace

ErrorCode LastError() {
    return lastError;
}

void SetLastError(ErrorCode code) {
    lastError = code;
}

std::string ErrorText(ErrorCode code) {
    const char* const text = LookUp(Messages, code, static_cast<const char*>(nullptr));
    return text ? text : "Unknown error " + std::to_string(code) + ".";
}

}  // namespace Varnholt::Platform
