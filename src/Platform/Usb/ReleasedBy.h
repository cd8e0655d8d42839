#pragma once

namespace Varnholt::Platform::Usb {

/// For `std::unique_ptr`: lets go of what a C library has handed out.
template <auto Release>
struct ReleasedBy {
    template <class T>
    void operator()(T* object) const {
        Release(object);
    }
};

}  // namespace Varnholt::Platform::Usb
