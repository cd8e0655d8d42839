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

class SetupApiList final : public InterfaceList {
  public:
    SetupApiList(const SetupApi::EntryPoints& entryPoints, HDEVINFO deviceInfo)
        : api_(entryPoints), list_(deviceInfo) {}
    ~SetupApiList() override { api_.destroyDeviceInfoList(list_); }

    ErrorCode ReadPath(const Protocol::Guid& interfaceClass, std::uint32_t index,
                       std::string& path) const override {
        SP_DEVICE_INTERFACE_DATA record{};
        record.cbSize = sizeof record;
        if (!api_.enumDeviceInterfaces(list_, nullptr, SystemGuid(interfaceClass), index, &record)) {
            return FailureOfCall();
        }
        DWORD size = 0;
        api_.getDeviceInterfaceDetail(list_, &record, nullptr, 0, &size, nullptr);
        constexpr std::size_t pathOffset = offsetof(SP_DEVICE_INTERFACE_DETAIL_DATA_A, DevicePath);
        if (size <= pathOffset) {
            return Errors::NoInterfaceDetail;
        }
        std::vector<std::byte> bytes(size + 1);  // the path ends inside, whatever the system fills in
        auto* const detail = reinterpret_cast<SP_DEVICE_INTERFACE_DETAIL_DATA_A*>(bytes.data());
        detail->cbSize = sizeof *detail;
        if (!api_.getDeviceInterfaceDetail(list_, &record, detail, size, nullptr, nullptr)) {
            return FailureOfCall();
        }
        path = reinterpret_cast<const char*>(bytes.data() + pathOffset);
        return Errors::Success;
    }

  private:
    const SetupApi::EntryPoints& api_;
    const HDEVINFO list_;
};

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
    const HDEVINFO list = entryPoints_.getClassDevs(SystemGuid(interfaceClass), nullptr, nullptr,
                                                    DIGCF_PRESENT | DIGCF_DEVICEINTERFACE);
    if (list == nullptr || list == InvalidHandle()) {
        return nullptr;
    }
    return std::make_shared<SetupApiList>(entryPoints_, list);
}

}  // namespace Varnholt::Platform
