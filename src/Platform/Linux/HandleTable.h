#pragma once

#include <new>
#include <string_view>

#include "Platform/CallFilter.h"
#include "Platform/HandleMap.h"
#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

/// Says which handle names which waitable object.
class HandleTable final {
  public:
    static HandleTable& Instance();

    Handle Add(ObjectRef object);
    /// Null, with `Errors::InvalidHandle` in `LastError`, when the handle names nothing.
    ObjectRef Find(Handle handle);
    /// As `Find`, for an object of one kind.
    template <typename Kind>
    std::shared_ptr<Kind> FindAs(Handle handle) {
        auto object = std::dynamic_pointer_cast<Kind>(Find(handle));
        if (!object) {
            SetLastError(Errors::InvalidHandle);
        }
        return object;
    }
    bool Close(Handle handle);

  private:
    HandleMap<WaitableObject, 1> objects_;
};

/// Runs what makes an object and its handle, unless the platform call must fail. Without memory for them
/// there is none, and `LastError` says so.
template <typename Make>
Handle HandleOf(std::string_view call, Make make) {
    if (CallMustFail(call)) {
        return NoHandle;
    }
    try {
        return make();
    } catch (const std::bad_alloc&) {
        SetLastError(Errors::NotEnoughMemory);
        return NoHandle;
    }
}

}  // namespace Varnholt::Platform::Linux
