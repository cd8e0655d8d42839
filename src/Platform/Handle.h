#pragma once

#include <utility>

namespace Varnholt::Platform {

/// Names a waitable object, a thread or an open device file. A handle that names nothing is refused with
/// `Errors::InvalidHandle`, whatever its value; it is never dereferenced by callers. Whoever hands out
/// handles keeps to its own values, so that the handle of one is never taken for that of another: the
/// system's on Windows are 0 modulo 4, waitable objects and threads on other platforms 1, files of `Drivers`
/// 2; 3 is `InvalidHandle`.
using Handle = void*;
inline constexpr Handle NoHandle = nullptr;

/// What an open that failed returns, as opposed to `NoHandle`.
Handle InvalidHandle();

/// Closes a waitable object or thread handle. The object lives on while a wait or a thread still needs it.
bool Close(Handle handle);

/// Owns one waitable object or thread handle and closes it.
class OwnedHandle final {
  public:
    OwnedHandle() = default;
    explicit OwnedHandle(Handle owned) : handle_(owned) {}
    OwnedHandle(OwnedHandle&& other) noexcept : handle_(std::exchange(other.handle_, NoHandle)) {}
    OwnedHandle& operator=(OwnedHandle&& other) noexcept {
        std::swap(handle_, other.handle_);
        return *this;
    }
    ~OwnedHandle() { Reset(); }

    Handle Get() const { return handle_; }
    explicit operator bool() const { return handle_ != NoHandle; }
    /// The handle is the caller's from here on.
    Handle Release() { return std::exchange(handle_, NoHandle); }
    void Reset() {
        if (handle_ != NoHandle) {
            Close(Release());
        }
    }

  private:
    Handle handle_ = NoHandle;
};

}  // namespace Varnholt::Platform
