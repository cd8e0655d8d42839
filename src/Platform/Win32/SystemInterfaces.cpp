#include "Platform/SystemInterfaces.h"

#include "Platform/HostQueries.h"
#include "Platform/Win32/RegistryInterfaces.h"
#include "Platform/Win32/SetupApi.h"
#include "Platform/Win32/SetupApiList.h"

namespace Varnholt::Platform {
namespace {

/// NT hosts before version 5 have no device-interface enumeration.
bool HostKeepsInterfacesInRegistry() {
    constexpr std::uint32_t NtFamily = 2;
    const VersionRecord version = ReadVersionRecord();
    return version.platformId == NtFamily && version.major < 5;
}

}  // namespace

DeviceList MakeSystemList(const Protocol::Guid& interfaceClass, bool withRegistryFallback) {
    if (withRegistryFallback && HostKeepsInterfacesInRegistry()) {
        return MakePathList(interfaceClass, ListRegistryInterfaces(interfaceClass));
    }
    return MakeSetupApiList(SystemSetupApi(), interfaceClass);
}

}  // namespace Varnholt::Platform
