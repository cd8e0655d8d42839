#pragma once

#include <algorithm>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <shared_mutex>
#include <utility>

#include "Platform/Handle.h"

namespace Varnholt::Platform {

/// The objects behind the handles of one kind, whose values are `First` and every fourth from there on (see
/// Handle.h). What was taken out has no handle any more; values are not used twice as long as there are
/// others. Any thread.
template <class Object, std::uintptr_t First>
class HandleMap final {
  public:
    Handle Add(std::shared_ptr<Object> object) {
        const std::unique_lock held(lock_);
        Handle handle = NoHandle;
        do {
            last_ = std::max(last_ + 4, First);
            handle = reinterpret_cast<Handle>(last_);
        } while (objects_.contains(handle));
        objects_.emplace(handle, std::move(object));
        return handle;
    }

    /// Null for a value that is no handle.
    std::shared_ptr<Object> Find(Handle handle) const {
        const std::shared_lock held(lock_);
        const auto found = objects_.find(handle);
        return found != objects_.end() ? found->second : nullptr;
    }
    /// As `Find`; the handle is no handle any more.
    std::shared_ptr<Object> Take(Handle handle) {
        const std::unique_lock held(lock_);
        auto taken = objects_.extract(handle);
        return taken ? std::move(taken.mapped()) : nullptr;
    }
    /// The next object in order, whose handle `handle` becomes; null behind the last.
    std::shared_ptr<Object> FindBehind(Handle& handle) const {
        const std::shared_lock held(lock_);
        const auto next = objects_.upper_bound(handle);
        if (next == objects_.end()) {
            return nullptr;
        }
        handle = next->first;
        return next->second;
    }
    std::size_t Size() const {
        const std::shared_lock held(lock_);
        return objects_.size();
    }

  private:
    mutable std::shared_mutex lock_;  ///< guards what follows, for a few instructions
    std::map<Handle, std::shared_ptr<Object>> objects_;
    std::uintptr_t last_ = 0;
};

}  // namespace Varnholt::Platform
