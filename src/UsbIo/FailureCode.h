#pragma once

#include "Platform/ErrorCodes.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::UsbIo {

/// The code of the platform call that has just failed; never success, whatever the platform left behind.
inline Platform::ErrorCode FailureCode() {
    const Platform::ErrorCode code = Platform::LastError();
    return code == Platform::Errors::Success ? Protocol::UsbIoDriver::Status::Failed : code;
}

}  // namespace Varnholt::UsbIo
