#include "Platform/Linux/HandleTable.h"

#include "Platform/Linux/NoDestructor.h"

namespace Varnholt::Platform {
namespace Linux {

HandleTable& HandleTable::Instance() {
    static NoDestructor<HandleTable> table;
    return *table;
}

Handle HandleTable::Add(ObjectRef object) {
    {
        const DispatcherLock hold;
        ++object->handles_;
    }
    return objects_.Add(std::move(object));
}

ObjectRef HandleTable::Find(Handle handle) {
    ObjectRef object = objects_.Find(handle);
    if (!object) {
        SetLastError(Errors::InvalidHandle);
    }
    return object;
}

bool HandleTable::Close(Handle handle) {
    const ObjectRef object = objects_.Take(handle);  // dies without a lock held: its end may take time
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
