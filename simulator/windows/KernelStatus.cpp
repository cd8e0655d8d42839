#include "KernelStatus.h"

#include <cstdint>
#include <utility>

#include "Platform/LookUp.h"

namespace Varnholt::Simulator {

namespace Errors = Platform::Errors;

Status KernelStatus(Platform::ErrorCode code) {
    static constexpr std::pair<Platform::ErrorCode, std::uint32_t> statuses[] = {
        {Errors::Success, 0},
        {Errors::InvalidFunction, 0xC0000010},     // STATUS_INVALID_DEVICE_REQUEST
        {Errors::FileNotFound, 0xC0000034},        // STATUS_OBJECT_NAME_NOT_FOUND
        {Errors::AccessDenied, 0xC0000022},        // STATUS_ACCESS_DENIED
        {Errors::GeneralFailure, 0xC0000001},      // STATUS_UNSUCCESSFUL
        {Errors::NotSupported, 0xC00000BB},        // STATUS_NOT_SUPPORTED
        {Errors::InvalidParameter, 0xC000000D},    // STATUS_INVALID_PARAMETER
        {Errors::SemaphoreTimeout, 0xC00000B5},    // STATUS_IO_TIMEOUT
        {Errors::InsufficientBuffer, 0xC0000023},  // STATUS_BUFFER_TOO_SMALL
        {Errors::Busy, 0x80000011},                // STATUS_DEVICE_BUSY
        {Errors::OperationAborted, 0xC0000120},    // STATUS_CANCELLED
        {Errors::DeviceNotConnected, 0xC000009D},  // STATUS_DEVICE_NOT_CONNECTED
        {Errors::NoSystemResources, 0xC000009A},   // STATUS_INSUFFICIENT_RESOURCES
    };
    // The codes of the USBIO driver are marked as an application's own and pass as they are; of the others,
    // the kernel has a range that stands for the system's error codes.
    constexpr std::uint32_t ApplicationMark = 0x20000000;
    constexpr std::uint32_t SystemErrorRange = 0xC0010000;
    const std::uint32_t others = (code & ApplicationMark) != 0 ? code : SystemErrorRange | (code & 0xFFFF);
    return static_cast<Status>(Platform::LookUp(statuses, code, others));
}

}  // namespace Varnholt::Simulator
