#include "Platform/Win32/SetupApi.h"

#include <cstddef>
#include <vector>

#include "Platform/Handle.h"

namespace Varnholt::Platform {
namespace {

SetupApi systemSetupApi;

static_assert(sizeof(Protocol::Guid) == sizeof(GUID));
static_assert(sizeof(SP_DEVICE_INTERFACE_DATA) == 28 && sizeof(SP_DEVICE_INTERFACE_DETAIL_DATA_A) == 5);

const GUID* SystemGuid(const Protocol::Guid& guid) {
    return reinterpret_cast<const GUID*>(&guid);
}

/// The code of the call that has just failed; never success, whatever the system left behind.
ErrorCode FailureOfCall() {
    const ErrorCode code = LastError();
    return code == Errors::Success ? Errors::NoInterfaceDetail : code;
}

/// The path of an interface, or why there is none.
InterfaceList::Entry ReadDetail(const SetupApi::EntryPoints& api, HDEVINFO list,
                                SP_DEVICE_INTERFACE_DATA& record) {
    DWORD size = 0;
    api.getDeviceInterfaceDetail(list, &record, nullptr, 0, &size, nullptr);
    constexpr std::size_t pathOffset = offsetof(SP_DEVICE_INTERFACE_DETAIL_DATA_A, DevicePath);
    if (size <= pathOffset) {
        return {Errors::NoInterfaceDetail, {}};
    }
    std::vector<std::byte> bytes(size + 1);  // the path ends inside, whatever the system fills in
    auto* const detail = reinterpret_cast<SP_DEVICE_INTERFACE_DETAIL_DATA_A*>(bytes.data());
    detail->cbSize = sizeof *detail;
    if (!api.getDeviceInterfaceDetail(list, &record, detail, size, nullptr, nullptr)) {
        return {FailureOfCall(), {}};
    }
    return {Errors::Success, reinterpret_cast<const char*>(bytes.data() + pathOffset)};
}

}  // namespace

SetupApi& SystemSetupApi() {
    return systemSetupApi;
}

SetupApi::~SetupApi() {
    Unload();
}

bool SetupApi::Load() {
    const std::lock_guard held(lock_);
    if (module_ != nullptr) {
        return true;
    }
    module_ = ::LoadLibraryA("setupapi.dll");
    if (module_ == nullptr) {
        return false;
    }
    const auto find = [this]<typename Function>(Function*& entryPoint, const char* name) {
        entryPoint = FindEntryPoint<Function>(module_, name);
        return entryPoint != nullptr;
    };
    if (find(entryPoints_.getClassDevs, "SetupDiGetClassDevsA") &&
        find(entryPoints_.destroyDeviceInfoList, "SetupDiDestroyDeviceInfoList") &&
        find(entryPoints_.enumDeviceInterfaces, "SetupDiEnumDeviceInterfaces") &&
        find(entryPoints_.getDeviceInterfaceDetail, "SetupDiGetDeviceInterfaceDetailA")) {
        return true;
    }
    const DWORD code = ::GetLastError();
    Unload();
    ::SetLastError(code);
    return false;
}

void SetupApi::Unload() {
    if (module_ != nullptr) {
        ::FreeLibrary(module_);
    }
    module_ = nullptr;
    entryPoints_ = {};
}

DeviceList SetupApi::MakeList(const Protocol::Guid& interfaceClass) {
    if (!Load()) {
        return nullptr;
    }
    const HDEVINFO system = entryPoints_.getClassDevs(SystemGuid(interfaceClass), nullptr, nullptr,
                                                      DIGCF_PRESENT | DIGCF_DEVICEINTERFACE);
    if (system == nullptr || system == InvalidHandle()) {
        return nullptr;
    }
    const struct Owner {
        const EntryPoints& api;
        HDEVINFO system;
        ~Owner() { api.destroyDeviceInfoList(system); }
    } owner{entryPoints_, system};
    auto list = std::make_shared<InterfaceList>(interfaceClass);
    SP_DEVICE_INTERFACE_DATA record{};
    record.cbSize = sizeof record;
    while (entryPoints_.enumDeviceInterfaces(system, nullptr, SystemGuid(interfaceClass),
                                             static_cast<DWORD>(list->entries.size()), &record)) {
        list->entries.push_back(ReadDetail(entryPoints_, system, record));
    }
    if (const ErrorCode end = FailureOfCall(); end != Errors::NoMoreItems) {
        list->entries.push_back({end, {}});
    }
    return list;
}

}  // namespace Varnholt::Platform
