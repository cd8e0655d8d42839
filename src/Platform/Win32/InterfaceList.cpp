#include "Platform/Win32/InterfaceList.h"

#include <utility>

#include "Platform/Handle.h"
#include "Platform/ListedInterfaces.h"

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

const GUID* SystemGuid(const Protocol::Guid& guid) {
    return reinterpret_cast<const GUID*>(&guid);
}

SP_DEVICE_INTERFACE_DATA SystemRecord(const InterfaceRecord& record) {
    return {record.size, *SystemGuid(record.interfaceClass), record.flags, record.reserved};
}

class SetupApiList final : public InterfaceList {
  public:
    SetupApiList(const SetupApi::EntryPoints& entryPoints, HDEVINFO deviceInfo)
        : api_(entryPoints), list_(deviceInfo) {}
    ~SetupApiList() override { api_.destroyDeviceInfoList(list_); }

    bool Find(const Protocol::Guid& interfaceClass, std::uint32_t index, InterfaceRecord& record) override {
        return api_.enumDeviceInterfaces(list_, nullptr, SystemGuid(interfaceClass), index,
                                         reinterpret_cast<SP_DEVICE_INTERFACE_DATA*>(&record)) != 0;
    }

    std::uint32_t DetailSize(const InterfaceRecord& record) override {
        SP_DEVICE_INTERFACE_DATA systemRecord = SystemRecord(record);
        DWORD size = 0;
        api_.getDeviceInterfaceDetail(list_, &systemRecord, nullptr, 0, &size, nullptr);
        return size;
    }

    bool ReadDetail(const InterfaceRecord& record, std::span<std::byte> detail) override {
        SP_DEVICE_INTERFACE_DATA systemRecord = SystemRecord(record);
        return api_.getDeviceInterfaceDetail(
                   list_, &systemRecord, reinterpret_cast<SP_DEVICE_INTERFACE_DETAIL_DATA_A*>(detail.data()),
                   static_cast<DWORD>(detail.size()), nullptr, nullptr) != 0;
    }

  private:
    const SetupApi::EntryPoints& api_;
    const HDEVINFO list_;
};

class PathList final : public InterfaceList {
  public:
    PathList(const Protocol::Guid& interfaceClass, std::vector<std::string> paths)
        : listed_(interfaceClass, std::move(paths)) {}

    bool Find(const Protocol::Guid& interfaceClass, std::uint32_t index, InterfaceRecord& record) override {
        return listed_.Find(interfaceClass, index, record);
    }
    std::uint32_t DetailSize(const InterfaceRecord& record) override { return listed_.DetailSize(record); }
    bool ReadDetail(const InterfaceRecord& record, std::span<std::byte> detail) override {
        return listed_.ReadDetail(record, detail);
    }

  private:
    const ListedInterfaces listed_;
};

}  // namespace

std::shared_ptr<InterfaceList> MakeSetupApiList(SetupApi& setupApi, const Protocol::Guid& interfaceClass) {
    const SetupApi::EntryPoints* api = setupApi.Load();
    if (api == nullptr) {
        return nullptr;
    }
    const HDEVINFO list = api->getClassDevs(SystemGuid(interfaceClass), nullptr, nullptr,
                                            DIGCF_PRESENT | DIGCF_DEVICEINTERFACE);
    if (list == nullptr || list == InvalidHandle()) {
        return nullptr;
    }
    return std::make_shared<SetupApiList>(*api, list);
}

std::shared_ptr<InterfaceList> MakePathList(const Protocol::Guid& interfaceClass,
                                            std::vector<std::string> paths) {
    return std::make_shared<PathList>(interfaceClass, std::move(paths));
}

}  // namespace Varnholt::Platform
