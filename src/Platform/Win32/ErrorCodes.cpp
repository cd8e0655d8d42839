#include "Platform/ErrorCodes.h"

#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {

// The numbers are spelled out in the header, because the other platforms have no header to take them from.
static_assert(Errors::FileNotFound == ERROR_FILE_NOT_FOUND && Errors::PathNotFound == ERROR_PATH_NOT_FOUND &&
              Errors::AccessDenied == ERROR_ACCESS_DENIED && Errors::InvalidHandle == ERROR_INVALID_HANDLE);
static_assert(Errors::NotEnoughMemory == ERROR_NOT_ENOUGH_MEMORY &&
              Errors::InvalidData == ERROR_INVALID_DATA && Errors::NotReady == ERROR_NOT_READY &&
              Errors::GeneralFailure == ERROR_GEN_FAILURE);
static_assert(Errors::NotSupported == ERROR_NOT_SUPPORTED &&
              Errors::InvalidParameter == ERROR_INVALID_PARAMETER &&
              Errors::CallNotImplemented == ERROR_CALL_NOT_IMPLEMENTED &&
              Errors::SemaphoreTimeout == ERROR_SEM_TIMEOUT);
static_assert(Errors::InsufficientBuffer == ERROR_INSUFFICIENT_BUFFER &&
              Errors::ModuleNotFound == ERROR_MOD_NOT_FOUND &&
              Errors::ProcedureNotFound == ERROR_PROC_NOT_FOUND && Errors::Busy == ERROR_BUSY);
static_assert(Errors::NoMoreItems == ERROR_NO_MORE_ITEMS && Errors::NotOwner == ERROR_NOT_OWNER &&
              Errors::TooManyPosts == ERROR_TOO_MANY_POSTS &&
              Errors::OperationAborted == ERROR_OPERATION_ABORTED);
static_assert(Errors::IoIncomplete == ERROR_IO_INCOMPLETE && Errors::IoPending == ERROR_IO_PENDING &&
              Errors::DeviceNotConnected == ERROR_DEVICE_NOT_CONNECTED &&
              Errors::NoSystemResources == ERROR_NO_SYSTEM_RESOURCES);

ErrorCode LastError() {
    return ::GetLastError();
}

void SetLastError(ErrorCode code) {
    ::SetLastError(code);
}

std::string ErrorText(ErrorCode code) {
    char* text = nullptr;
    // A message is taken as it stands: there is nothing to put into its inserts.
    const DWORD length = ::FormatMessageA(
        FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS, nullptr,
        code, MAKELANGID(LANG_NEUTRAL, SUBLANG_DEFAULT), reinterpret_cast<char*>(&text), 0, nullptr);
    if (length == 0) {
        return {};
    }
    struct Owner {
        char* text;
        ~Owner() { ::LocalFree(text); }
    } const owner{text};
    return std::string(text, length);
}

}  // namespace Varnholt::Platform
