#include "Platform/DeviceInterfaces.h"

#include <utility>

#include "Platform/CallFilter.h"
#include "Platform/DeviceFiles.h"
#include "Platform/SystemInterfaces.h"

namespace Varnholt::Platform {
namespace {

class PathList final : public InterfaceList {
  public:
    PathList(const Protocol::Guid& interfaceClass, std::vector<std::string> paths)
        : class_(interfaceClass), paths_(std::move(paths)) {}

    ErrorCode ReadPath(const Protocol::Guid& interfaceClass, std::uint32_t index,
                       std::string& path) const override {
        if (interfaceClass != class_ || index >= paths_.size()) {
            return Errors::NoMoreItems;
        }
        path = paths_[index];
        return Errors::Success;
    }

  private:
    const Protocol::Guid class_;
    const std::vector<std::string> paths_;
};

bool FilesAreReplaced() {
    return &DeviceFiles() != &SystemDeviceFiles();
}

}  // namespace

bool DeviceInterfaces::Load() {
    return !CallMustFail("LoadEnumeration") && DeviceFiles().LoadEnumeration();
}

DeviceList DeviceInterfaces::MakeList(const Protocol::Guid& interfaceClass, bool withRegistryFallback) {
    if (CallMustFail("LoadEnumeration") || CallMustFail("MakeList")) {
        return nullptr;
    }
    return FilesAreReplaced() ? MakePathList(interfaceClass, DeviceFiles().ListInterfaces(interfaceClass))
                              : MakeSystemList(interfaceClass, withRegistryFallback);
}

ErrorCode DeviceInterfaces::ReadPath(const DeviceList& list, const Protocol::Guid& interfaceClass,
                                     std::uint32_t index, std::string& path) {
    if (CallMustFail("ReadPath")) {
        return LastError();
    }
    return list ? list->ReadPath(interfaceClass, index, path) : Errors::InvalidHandle;
}

DeviceList MakePathList(const Protocol::Guid& interfaceClass, std::vector<std::string> paths) {
    return std::make_shared<PathList>(interfaceClass, std::move(paths));
}

}  // namespace Varnholt::Platform
