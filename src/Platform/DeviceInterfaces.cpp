#include "Platform/DeviceInterfaces.h"

#include "Platform/CallFilter.h"
#include "Platform/DeviceFiles.h"

namespace Varnholt::Platform {

bool DeviceInterfaces::Load() {
    return !CallMustFail("LoadEnumeration") && DeviceFiles().LoadEnumeration();
}

DeviceList DeviceInterfaces::MakeList(const Protocol::Guid& interfaceClass, bool withRegistryFallback) {
    if (CallMustFail("LoadEnumeration") || CallMustFail("MakeList")) {
        return nullptr;
    }
    return DeviceFiles().MakeList(interfaceClass, withRegistryFallback);
}

ErrorCode DeviceInterfaces::ReadPath(const DeviceList& list, const Protocol::Guid& interfaceClass,
                                     std::uint32_t index, std::string& path) {
    if (CallMustFail("ReadPath")) {
        return LastError();
    }
    if (!list) {
        return Errors::InvalidHandle;
    }
    if (interfaceClass != list->interfaceClass || index >= list->entries.size()) {
        return Errors::NoMoreItems;
    }
    path = list->entries[index].path;
    return list->entries[index].code;
}

}  // namespace Varnholt::Platform
