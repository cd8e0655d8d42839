#pragma once

#include <new>
#include <utility>

namespace Varnholt::Platform::Linux {

/// A static object that is never destroyed, because threads that nobody waits for may still use it while the
/// process ends. `Object` must hold no memory of its own when it is at rest: what unloading this library
/// would leave behind.
template <typename Object>
class NoDestructor final {
  public:
    template <typename... Arguments>
    explicit NoDestructor(Arguments&&... arguments) {
        new (storage_) Object(std::forward<Arguments>(arguments)...);
    }
    NoDestructor(const NoDestructor&) = delete;
    NoDestructor& operator=(const NoDestructor&) = delete;

    Object& operator*() { return *std::launder(reinterpret_cast<Object*>(storage_)); }

  private:
    alignas(Object) unsigned char storage_[sizeof(Object)];
};

}  // namespace Varnholt::Platform::Linux
