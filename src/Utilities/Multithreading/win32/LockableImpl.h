#pragma once

#include <string>

#include "Platform/Handle.h"
#include "Platform/WaitableObjects.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::Utilities::Multithreading {

/// The locking half of a lock that is a waitable object of the platform; unlocking is what the kinds differ
/// in.
template <class T>
class Win32Lockable : public T {
  public:
    /// Takes ownership of `newHandle`; `NoHandle` is refused with `InvalidArgumentException`.
    Win32Lockable(Platform::Handle newHandle, const std::string& objectName);

    void Lock() override { Platform::Wait(handle_.Get(), Platform::Infinite); }
    /// Throws `InvalidArgumentException` when the previous owner of a mutex ended without releasing it. The
    /// mutex is then free again: a caller that is told of a failure does not unlock.
    bool TryLock(int timeout) override;
    Platform::Handle GetHandle() override { return handle_.Get(); }

  private:
    Platform::OwnedHandle handle_;
    std::string name_;
};

template <class T>
Win32Lockable<T>::Win32Lockable(Platform::Handle newHandle, const std::string& objectName) try
    : handle_(newHandle), name_(objectName) {
    if (!handle_) {
        throw Exceptions::InvalidArgumentException("handle is NULL", Exceptions::Here());
    }
}
TRACED

template <class T>
bool Win32Lockable<T>::TryLock(int timeout) try {
    const std::uint32_t limit = timeout < 0 ? Platform::Infinite : static_cast<std::uint32_t>(timeout);
    switch (Platform::Wait(handle_.Get(), limit)) {
        case Platform::WaitResult::Signalled:
            return true;
        case Platform::WaitResult::TimedOut:
            return false;
        case Platform::WaitResult::Abandoned:
            this->Unlock();
            break;
        case Platform::WaitResult::Failed:
            break;
    }
    throw Exceptions::InvalidArgumentException("invalid mutex", Exceptions::Here());
}
TRACED

}  // namespace Varnholt::Utilities::Multithreading
