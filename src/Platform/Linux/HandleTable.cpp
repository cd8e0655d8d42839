#include "Platform/Linux/HandleTable.h"

#include "Platform/Linux/NoDestructor.h"

namespace Varnholt::Platform {
namespace Linux {
namespace {

/// Handles of waitable objects are 1 modulo 4 (see Handle.h).
constexpr std::uintptr_t Step = 4;
constexpr std::uintptr_t FirstValue = 1;

std::uintptr_t Value(Handle handle) {
    return reinterpret_cast<std::uintptr_t>(handle);
}

}  // namespace

HandleTable& HandleTable::Instance() {
    static NoDestructor<HandleTable> table;
    return *table;
}

Handle HandleTable::Add(ObjectRef object) {
    {
        const DispatcherLock hold;
        ++object->handles_;
    }
    const std::unique_lock held(lock_);
    do {
        last_ = last_ == 0 ? FirstValue : last_ + Step;
    } while (objects_.contains(last_));
    objects_.emplace(last_, std::move(object));
    return reinterpret_cast<Handle>(last_);
}

ObjectRef HandleTable::Find(Handle handle) {
    {
        const std::shared_lock held(lock_);
        const auto found = objects_.find(Value(handle));
        if (found != objects_.end()) {
            return found->second;
        }
    }
    SetLastError(Errors::InvalidHandle);
    return nullptr;
}

bool HandleTable::Close(Handle handle) {
    ObjectRef object;  // dies without a lock held: its end may be a matter of files or threads
    {
        const std::unique_lock held(lock_);
        const auto found = objects_.find(Value(handle));
        if (found != objects_.end()) {
            object = std::move(found->second);
            objects_.erase(found);
        }
    }
    if (!object) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    ThreadRecord& me = CurrentThread();
    const DispatcherLock hold;
    if (--object->handles_ == 0) {
        object->LastHandleClosed(me);
    }
    return true;
}

}  // namespace Linux

Handle InvalidHandle() {
    return reinterpret_cast<Handle>(~std::uintptr_t{0});
}

bool Close(Handle handle) {
    return Linux::HandleTable::Instance().Close(handle);
}

}  // namespace Varnholt::Platform
