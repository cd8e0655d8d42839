#pragma once

#include <cstddef>
#include <memory>
#include <new>

namespace Varnholt::Platform {

/// Holds a platform's `Impl` inside its owner, which takes no memory for it: at most `Size` bytes.
template <class Impl, std::size_t Size>
class InPlace final {
  public:
    InPlace() {
        static_assert(sizeof(Impl) <= Size && alignof(Impl) <= alignof(void*));
        std::construct_at(reinterpret_cast<Impl*>(storage_));
    }
    ~InPlace() { std::destroy_at(&**this); }
    InPlace(const InPlace&) = delete;
    InPlace& operator=(const InPlace&) = delete;

    Impl& operator*() { return *std::launder(reinterpret_cast<Impl*>(storage_)); }
    Impl* operator->() { return &**this; }

  private:
    alignas(void*) std::byte storage_[Size];
};

}  // namespace Varnholt::Platform
