#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <utility>

#include "Platform/DeviceInterfaces.h"
#include "Platform/ErrorCodes.h"

namespace Varnholt::Platform {

/// Says which list a `DeviceList` names; one that is no more is refused like one that never was. Any thread.
template <class List>
class DeviceListTable final {
  public:
    DeviceList Add(std::shared_ptr<List> list) {
        const std::lock_guard held(lock_);
        lists_.emplace(++last_, std::move(list));
        return reinterpret_cast<DeviceList>(last_);
    }

    /// Null, with the error code set, for a list that is not there.
    std::shared_ptr<List> Find(DeviceList list) {
        const std::lock_guard held(lock_);
        const auto found = lists_.find(reinterpret_cast<std::uintptr_t>(list));
        if (found == lists_.end()) {
            SetLastError(Errors::InvalidHandle);
            return nullptr;
        }
        return found->second;
    }

    /// As `Find`; the list is named no longer.
    std::shared_ptr<List> Remove(DeviceList list) {
        std::shared_ptr<List> removed = Find(list);
        if (removed) {
            const std::lock_guard held(lock_);
            lists_.erase(reinterpret_cast<std::uintptr_t>(list));
        }
        return removed;
    }

  private:
    std::mutex lock_;
    std::map<std::uintptr_t, std::shared_ptr<List>> lists_;  // guarded by `lock`
    std::uintptr_t last_ = 0;                                // guarded by `lock`
};

}  // namespace Varnholt::Platform
