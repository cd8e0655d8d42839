#include "Platform/SystemInterfaces.h"

#include "Platform/HostQueries.h"
#include "Platform/Win32/RegistryInterfaces.h"
#include "Platform/Win32/SetupApi.h"
#include "Platform/Win32/SetupApiList.h"

namespace Varnholt::Platform {
namespace {

SetupApi setupApi;

/// NT hosts before version 5 have no device-interface enumeration.
bool HostKeepsInterfacesInRegistry() {
    constexpr std::uint32_t NtFamily = 2;
    const VersionRecord version = ReadVersionRecord();
    return version.platformId == NtFamily && version.major < 5;
}

}  // namespace

bool LoadSystemInterfaces() {
    return setupApi.Load() != nullptr;
}

DeviceList MakeSystemList(const Protocol::Guid& interfaceClass, bool withRegistryFallback) {
    if (withRegistryFallback && HostKeepsInterfacesInRegistry()) {
        return MakePathList(interfaceClass, ListRegistryInterfaces(interfaceClass));
    }
    return MakeSetupApiList(setupApi, interfaceClass);
}

}  // namespace Varnholt::Platform
