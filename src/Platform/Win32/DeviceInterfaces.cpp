#include "Platform/DeviceInterfaces.h"

#include <cstddef>
#include <cstring>
#include <memory>
#include <new>
#include <optional>

#include "Platform/CallFilter.h"
#include "Platform/DeviceFiles.h"
#include "Platform/HostQueries.h"
#include "Platform/ListedInterfaces.h"
#include "Platform/Win32/RegistryInterfaces.h"
#include "Platform/Win32/SetupApi.h"
#include "Platform/Win32/SystemInterfaces.h"

namespace Varnholt::Platform {
namespace {

// setupapi takes and gives these records as they are.
static_assert(sizeof(InterfaceRecord) == 28 && sizeof(InterfaceRecord) == sizeof(SP_DEVICE_INTERFACE_DATA));
static_assert(offsetof(InterfaceRecord, interfaceClass) ==
              offsetof(SP_DEVICE_INTERFACE_DATA, InterfaceClassGuid));
static_assert(offsetof(InterfaceRecord, flags) == offsetof(SP_DEVICE_INTERFACE_DATA, Flags));
static_assert(offsetof(InterfaceRecord, reserved) == offsetof(SP_DEVICE_INTERFACE_DATA, Reserved));
static_assert(InterfaceDetailSizeField == sizeof(SP_DEVICE_INTERFACE_DETAIL_DATA_A));
static_assert(InterfaceDetailPathOffset == offsetof(SP_DEVICE_INTERFACE_DETAIL_DATA_A, DevicePath));
static_assert(sizeof(Protocol::Guid) == sizeof(GUID));

SetupApi setupApi;

/// What a `DeviceList` points to: setupapi's list, or a list of paths where setupapi is not asked.
struct List {
    HDEVINFO deviceInfo = nullptr;
    std::optional<ListedInterfaces> listed;
};

List* Get(DeviceList list) {
    return static_cast<List*>(list);
}

const GUID* SystemGuid(const Protocol::Guid& guid) {
    return reinterpret_cast<const GUID*>(&guid);
}

SP_DEVICE_INTERFACE_DATA SystemRecord(const InterfaceRecord& record) {
    return {record.size, *SystemGuid(record.interfaceClass), record.flags, record.reserved};
}

bool FilesAreReplaced() {
    return &DeviceFiles() != &SystemDeviceFiles();
}

/// NT hosts before version 5 have no device-interface enumeration.
bool HostKeepsInterfacesInRegistry() {
    constexpr std::uint32_t NtFamily = 2;
    const VersionRecord version = ReadVersionRecord();
    return version.platformId == NtFamily && version.major < 5;
}

/// Null on failure, also where setupapi says it with its invalid handle.
HDEVINFO AskForPresentInterfaces(const Protocol::Guid& interfaceClass) {
    const SetupApi::EntryPoints* api = setupApi.Load();
    if (api == nullptr) {
        return nullptr;
    }
    const HDEVINFO deviceInfo = api->getClassDevs(SystemGuid(interfaceClass), nullptr, nullptr,
                                                  DIGCF_PRESENT | DIGCF_DEVICEINTERFACE);
    return deviceInfo == InvalidHandle() ? nullptr : deviceInfo;
}

/// Makes the list that the system itself has.
DeviceList MakeSystemList(const Protocol::Guid& interfaceClass, bool withRegistryFallback) {
    auto list = std::make_unique<List>();
    if (withRegistryFallback && HostKeepsInterfacesInRegistry()) {
        list->listed.emplace(interfaceClass, ListRegistryInterfaces(interfaceClass));
    } else {
        list->deviceInfo = AskForPresentInterfaces(interfaceClass);
        if (list->deviceInfo == nullptr) {
            return nullptr;
        }
    }
    return list.release();
}

}  // namespace

bool DeviceInterfaces::Load() {
    return FilesAreReplaced() ? !CallMustFail("LoadEnumeration") : setupApi.Load() != nullptr;
}

DeviceList DeviceInterfaces::MakeList(const Protocol::Guid& interfaceClass, bool withRegistryFallback) {
    if (CallMustFail("MakeList")) {
        return nullptr;
    }
    if (!FilesAreReplaced()) {
        return MakeSystemList(interfaceClass, withRegistryFallback);
    }
    if (!Load()) {
        return nullptr;
    }
    auto list = std::make_unique<List>();
    list->listed.emplace(interfaceClass, DeviceFiles().ListInterfaces(interfaceClass));
    return list.release();
}

bool DeviceInterfaces::DestroyList(DeviceList list) {
    const std::unique_ptr<List> owned(Get(list));
    if (owned == nullptr) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    if (owned->listed) {
        return true;
    }
    const SetupApi::EntryPoints* api = setupApi.Load();
    return api != nullptr && api->destroyDeviceInfoList(owned->deviceInfo) != 0;
}

bool DeviceInterfaces::Find(DeviceList list, const Protocol::Guid& interfaceClass, std::uint32_t index,
                            InterfaceRecord& record) {
    if (CallMustFail("FindInterface")) {
        return false;
    }
    if (list == nullptr) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    if (const auto& listed = Get(list)->listed) {
        return listed->Find(interfaceClass, index, record);
    }
    const SetupApi::EntryPoints* api = setupApi.Load();
    return api != nullptr &&
           api->enumDeviceInterfaces(Get(list)->deviceInfo, nullptr, SystemGuid(interfaceClass), index,
                                     reinterpret_cast<SP_DEVICE_INTERFACE_DATA*>(&record)) != 0;
}

std::uint32_t DeviceInterfaces::DetailSize(DeviceList list, const InterfaceRecord& record) {
    if (CallMustFail("DetailSize")) {
        return 0;
    }
    if (list == nullptr) {
        SetLastError(Errors::InvalidHandle);
        return 0;
    }
    if (const auto& listed = Get(list)->listed) {
        return listed->DetailSize(record);
    }
    DWORD size = 0;
    if (const SetupApi::EntryPoints* api = setupApi.Load()) {
        SP_DEVICE_INTERFACE_DATA systemRecord = SystemRecord(record);
        api->getDeviceInterfaceDetail(Get(list)->deviceInfo, &systemRecord, nullptr, 0, &size, nullptr);
    }
    return size;
}

bool DeviceInterfaces::ReadDetail(DeviceList list, const InterfaceRecord& record,
                                  std::span<std::byte> detail) {
    if (CallMustFail("ReadDetail")) {
        return false;
    }
    if (list == nullptr) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    if (const auto& listed = Get(list)->listed) {
        return listed->ReadDetail(record, detail);
    }
    const SetupApi::EntryPoints* api = setupApi.Load();
    if (api == nullptr) {
        return false;
    }
    SP_DEVICE_INTERFACE_DATA systemRecord = SystemRecord(record);
    return api->getDeviceInterfaceDetail(Get(list)->deviceInfo, &systemRecord,
                                         reinterpret_cast<SP_DEVICE_INTERFACE_DETAIL_DATA_A*>(detail.data()),
                                         static_cast<DWORD>(detail.size()), nullptr, nullptr) != 0;
}

std::vector<std::string> ListSystemInterfaces(const Protocol::Guid& interfaceClass) {
    std::vector<std::string> paths;
    const DeviceList list = MakeSystemList(interfaceClass, true);
    if (list == nullptr) {
        return paths;
    }
    InterfaceRecord record;
    for (std::uint32_t index = 0; DeviceInterfaces::Find(list, interfaceClass, index, record); ++index) {
        std::vector<std::byte> detail(DeviceInterfaces::DetailSize(list, record));
        if (detail.size() <= InterfaceDetailPathOffset) {
            continue;
        }
        std::memcpy(detail.data(), &InterfaceDetailSizeField, sizeof InterfaceDetailSizeField);
        if (DeviceInterfaces::ReadDetail(list, record, detail)) {
            paths.emplace_back(reinterpret_cast<const char*>(detail.data() + InterfaceDetailPathOffset));
        }
    }
    DeviceInterfaces::DestroyList(list);
    return paths;
}

}  // namespace Varnholt::Platform
