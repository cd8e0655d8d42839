#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>

namespace Varnholt::Platform::Linux {

/// The objects of one kind that have a name and that this process has open: two handles of one name lead to
/// one object.
template <typename Object>
class NamedObjects final {
  public:
    /// `make` makes what is not open yet; null where that fails.
    template <typename Make>
    std::shared_ptr<Object> Open(const std::string& name, Make make) {
        const std::lock_guard held(lock_);
        std::erase_if(objects_, [](const auto& entry) { return entry.second.expired(); });
        const auto found = objects_.find(name);
        std::shared_ptr<Object> object = found == objects_.end() ? nullptr : found->second.lock();
        if (!object) {
            object = make();
            if (object) {
                objects_[name] = object;
            }
        }
        return object;
    }

  private:
    std::mutex lock_;
    std::map<std::string, std::weak_ptr<Object>> objects_;  // guarded by `lock`
};

}  // namespace Varnholt::Platform::Linux
