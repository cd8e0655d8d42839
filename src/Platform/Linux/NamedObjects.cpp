#include "Platform/Linux/NamedObjects.h"

#include <map>
#include <mutex>

#include "Platform/Linux/NoDestructor.h"
#include "Platform/Linux/SharedMutex.h"
#include "Platform/Linux/SharedSemaphore.h"

namespace Varnholt::Platform::Linux {
namespace {

/// The objects of one kind that this process has open, by name: two handles of one name lead to one object.
template <typename Object>
class OpenObjects final {
  public:
    template <typename Make>
    std::shared_ptr<Object> Open(const std::string& name, Make make) {
        const std::lock_guard held(lock_);
        std::erase_if(objects_, [](const auto& entry) { return entry.second.expired(); });
        const auto found = objects_.find(name);
        auto object = found == objects_.end() ? nullptr : found->second.lock();
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

NoDestructor<OpenObjects<MutexObject>> openMutexes;
NoDestructor<OpenObjects<SemaphoreObject>> openSemaphores;

}  // namespace

std::shared_ptr<MutexObject> OpenNamedMutex(const std::string& name) {
    return (*openMutexes).Open(name, [&name] {
        return CurrentClock().IsCooperative() ? std::make_shared<MutexObject>() : OpenSharedMutex(name);
    });
}

std::shared_ptr<SemaphoreObject> OpenNamedSemaphore(std::int32_t initialCount, std::int32_t maximumCount,
                                                    const std::string& name) {
    return (*openSemaphores).Open(name, [&]() -> std::shared_ptr<SemaphoreObject> {
        if (CurrentClock().IsCooperative()) {
            return std::make_shared<LocalSemaphore>(initialCount, maximumCount);
        }
        return OpenSharedSemaphore(initialCount, maximumCount, name);
    });
}

}  // namespace Varnholt::Platform::Linux
