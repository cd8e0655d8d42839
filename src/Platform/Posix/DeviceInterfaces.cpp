#include "Platform/DeviceInterfaces.h"

#include <map>
#include <memory>
#include <mutex>

#include "Platform/CallFilter.h"
#include "Platform/DeviceFiles.h"
#include "Platform/ListedInterfaces.h"
#include "Platform/Posix/Immortal.h"

namespace Varnholt::Platform {
namespace {

/// Says which list a `DeviceList` names; a list that is no more is refused like one that never was.
class Lists final {
  public:
    DeviceList Add(std::shared_ptr<const ListedInterfaces> list) {
        const std::lock_guard held(lock);
        lists.emplace(++last, std::move(list));
        return reinterpret_cast<DeviceList>(last);
    }

    std::shared_ptr<const ListedInterfaces> Find(DeviceList list) {
        const std::lock_guard held(lock);
        const auto found = lists.find(Value(list));
        if (found == lists.end()) {
            SetLastError(Errors::InvalidHandle);
            return nullptr;
        }
        return found->second;
    }

    bool Remove(DeviceList list) {
        const std::lock_guard held(lock);
        if (lists.erase(Value(list)) == 0) {
            SetLastError(Errors::InvalidHandle);
            return false;
        }
        return true;
    }

  private:
    static std::uintptr_t Value(DeviceList list) { return reinterpret_cast<std::uintptr_t>(list); }

    std::mutex lock;
    std::map<std::uintptr_t, std::shared_ptr<const ListedInterfaces>> lists;  // guarded by `lock`
    std::uintptr_t last = 0;                                                  // guarded by `lock`
};

Posix::Immortal<Lists> lists;

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
    return (*lists).Remove(list);
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
