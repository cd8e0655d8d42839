#include "Platform/DeviceInterfaces.h"

#include <memory>

#include "Platform/CallFilter.h"
#include "Platform/DeviceFiles.h"
#include "Platform/DeviceListTable.h"
#include "Platform/ListedInterfaces.h"
#include "Platform/Linux/Immortal.h"

namespace Varnholt::Platform {
namespace {

Linux::Immortal<DeviceListTable<const ListedInterfaces>> lists;

}  // namespace

bool DeviceInterfaces::Load() {
    return !CallMustFail("LoadEnumeration");
}

DeviceList DeviceInterfaces::MakeList(const Protocol::Guid& interfaceClass, bool /*withRegistryFallback*/) {
    if (!Load() || CallMustFail("MakeList")) {
        return nullptr;
    }
    return (*lists).Add(std::make_shared<const ListedInterfaces>(
        interfaceClass, DeviceFiles().ListInterfaces(interfaceClass)));
}

bool DeviceInterfaces::DestroyList(DeviceList list) {
    return (*lists).Remove(list) != nullptr;
}

bool DeviceInterfaces::Find(DeviceList list, const Protocol::Guid& interfaceClass, std::uint32_t index,
                            InterfaceRecord& record) {
    if (CallMustFail("FindInterface")) {
        return false;
    }
    const auto listed = (*lists).Find(list);
    return listed && listed->Find(interfaceClass, index, record);
}

std::uint32_t DeviceInterfaces::DetailSize(DeviceList list, const InterfaceRecord& record) {
    if (CallMustFail("DetailSize")) {
        return 0;
    }
    const auto listed = (*lists).Find(list);
    return listed ? listed->DetailSize(record) : 0;
}

bool DeviceInterfaces::ReadDetail(DeviceList list, const InterfaceRecord& record,
                                  std::span<std::byte> detail) {
    if (CallMustFail("ReadDetail")) {
        return false;
    }
    const auto listed = (*lists).Find(list);
    return listed && listed->ReadDetail(record, detail);
}

}  // namespace Varnholt::Platform
