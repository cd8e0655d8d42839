#include "Platform/DeviceInterfaces.h"

#include <cstring>
#include <memory>

#include "Platform/CallFilter.h"
#include "Platform/DeviceFiles.h"
#include "Platform/DeviceListTable.h"
#include "Platform/HostQueries.h"
#include "Platform/Win32/InterfaceList.h"
#include "Platform/Win32/RegistryInterfaces.h"
#include "Platform/Win32/SetupApi.h"
#include "Platform/Win32/SystemInterfaces.h"

namespace Varnholt::Platform {
namespace {

SetupApi setupApi;

DeviceListTable<InterfaceList> lists;  // behind setupApi, which its lists need to their end

bool FilesAreReplaced() {
    return &DeviceFiles() != &SystemDeviceFiles();
}

/// NT hosts before version 5 have no device-interface enumeration.
bool HostKeepsInterfacesInRegistry() {
    constexpr std::uint32_t NtFamily = 2;
    const VersionRecord version = ReadVersionRecord();
    return version.platformId == NtFamily && version.major < 5;
}

/// The list that the system itself has.
std::shared_ptr<InterfaceList> MakeSystemList(const Protocol::Guid& interfaceClass,
                                              bool withRegistryFallback) {
    if (withRegistryFallback && HostKeepsInterfacesInRegistry()) {
        return MakePathList(interfaceClass, ListRegistryInterfaces(interfaceClass));
    }
    return MakeSetupApiList(setupApi, interfaceClass);
}

}  // namespace

bool DeviceInterfaces::Load() {
    return !CallMustFail("LoadEnumeration") && (FilesAreReplaced() || setupApi.Load() != nullptr);
}

DeviceList DeviceInterfaces::MakeList(const Protocol::Guid& interfaceClass, bool withRegistryFallback) {
    if (CallMustFail("LoadEnumeration") || CallMustFail("MakeList")) {
        return nullptr;
    }
    auto list = FilesAreReplaced()
                    ? MakePathList(interfaceClass, DeviceFiles().ListInterfaces(interfaceClass))
                    : MakeSystemList(interfaceClass, withRegistryFallback);
    return list ? lists.Add(std::move(list)) : nullptr;
}

bool DeviceInterfaces::DestroyList(DeviceList list) {
    return lists.Remove(list) != nullptr;
}

bool DeviceInterfaces::Find(DeviceList list, const Protocol::Guid& interfaceClass, std::uint32_t index,
                            InterfaceRecord& record) {
    if (CallMustFail("FindInterface")) {
        return false;
    }
    const auto found = lists.Find(list);
    return found && found->Find(interfaceClass, index, record);
}

std::uint32_t DeviceInterfaces::DetailSize(DeviceList list, const InterfaceRecord& record) {
    if (CallMustFail("DetailSize")) {
        return 0;
    }
    const auto found = lists.Find(list);
    return found ? found->DetailSize(record) : 0;
}

bool DeviceInterfaces::ReadDetail(DeviceList list, const InterfaceRecord& record,
                                  std::span<std::byte> detail) {
    if (CallMustFail("ReadDetail")) {
        return false;
    }
    const auto found = lists.Find(list);
    return found && found->ReadDetail(record, detail);
}

std::vector<std::string> ListSystemInterfaces(const Protocol::Guid& interfaceClass) {
    std::vector<std::string> paths;
    const std::shared_ptr<InterfaceList> list = MakeSystemList(interfaceClass, true);
    if (list == nullptr) {
        return paths;
    }
    InterfaceRecord record;
    for (std::uint32_t index = 0; list->Find(interfaceClass, index, record); ++index) {
        std::vector<std::byte> detail(list->DetailSize(record));
        if (detail.size() <= InterfaceDetailPathOffset) {
            continue;
        }
        std::memcpy(detail.data(), &InterfaceDetailSizeField, sizeof InterfaceDetailSizeField);
        if (list->ReadDetail(record, detail)) {
            paths.emplace_back(reinterpret_cast<const char*>(detail.data() + InterfaceDetailPathOffset));
        }
    }
    return paths;
}

}  // namespace Varnholt::Platform
