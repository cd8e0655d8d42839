#include "Platform/SystemInterfaces.h"

#include "Platform/DeviceFiles.h"

namespace Varnholt::Platform {

DeviceList MakeSystemList(const Protocol::Guid& interfaceClass, bool /*withRegistryFallback*/) {
    return MakePathList(interfaceClass, SystemDeviceFiles().ListInterfaces(interfaceClass));
}

}  // namespace Varnholt::Platform
