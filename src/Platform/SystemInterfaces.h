#pragma once

#include "Platform/DeviceInterfaces.h"

/// For `DeviceInterfaces`: the enumeration of the system itself, whatever took the place of its device files.
namespace Varnholt::Platform {

DeviceList MakeSystemList(const Protocol::Guid& interfaceClass, bool withRegistryFallback);

}  // namespace Varnholt::Platform
