#pragma once

#include <cstdint>
#include <string>

/// What the library asks of an operating system. One interface, one folder per implementation (Win32, Linux),
/// chosen by the build. The comments here are the contract that each implementation keeps.
namespace Varnholt::Platform {

/// An operating-system error code. The Win32 numbers are used on every platform, because the layers above
/// pass them on to the host; driver status codes of 0xE0000000 and above travel in the same variable.
using ErrorCode = std::uint32_t;

namespace Errors {
inline constexpr ErrorCode Success = 0;
inline constexpr ErrorCode InvalidFunction = 1;
inline constexpr ErrorCode FileNotFound = 2;
inline constexpr ErrorCode PathNotFound = 3;
inline constexpr ErrorCode AccessDenied = 5;
inline constexpr ErrorCode InvalidHandle = 6;
inline constexpr ErrorCode NotEnoughMemory = 8;
inline constexpr ErrorCode InvalidData = 13;
inline constexpr ErrorCode NotReady = 21;
inline constexpr ErrorCode GeneralFailure =
    31;  ///< a device attached to the system is not functioning: stall, bus error
inline constexpr ErrorCode NotSupported = 50;
inline constexpr ErrorCode InvalidParameter = 87;
inline constexpr ErrorCode CallNotImplemented = 120;
inline constexpr ErrorCode SemaphoreTimeout = 121;
inline constexpr ErrorCode InsufficientBuffer = 122;
inline constexpr ErrorCode ModuleNotFound = 126;
inline constexpr ErrorCode ProcedureNotFound = 127;
inline constexpr ErrorCode Busy = 170;  ///< the resource is in use, also by another process
inline constexpr ErrorCode NoMoreItems = 259;
inline constexpr ErrorCode NotOwner = 288;
inline constexpr ErrorCode TooManyPosts = 298;
inline constexpr ErrorCode OperationAborted = 995;
inline constexpr ErrorCode IoIncomplete = 996;
inline constexpr ErrorCode IoPending = 997;
inline constexpr ErrorCode DeviceNotConnected = 1167;
inline constexpr ErrorCode NoSystemResources = 1450;
/// The library's own: a listed interface has no path, and the system does not say why.
inline constexpr ErrorCode NoInterfaceDetail = 0x20000001;
}  // namespace Errors

/// The calling thread's code of the last platform call that failed. Save it at once: any later call may
/// replace it.
ErrorCode LastError();
void SetLastError(ErrorCode code);

/// The platform's message for `code`, as the platform gives it (on Windows with its line break); never empty
/// on Linux, empty on Windows where the system has no message.
std::string ErrorText(ErrorCode code);

}  // namespace Varnholt::Platform
