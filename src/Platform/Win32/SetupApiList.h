#pragma once

#include "Platform/DeviceInterfaces.h"
#include "Platform/Win32/SetupApi.h"

namespace Varnholt::Platform {

/// The present interfaces of a class as setupapi lists them; null, with the error code set, on failure. The
/// list must not outlive `setupApi`.
DeviceList MakeSetupApiList(SetupApi& setupApi, const Protocol::Guid& interfaceClass);

}  // namespace Varnholt::Platform
