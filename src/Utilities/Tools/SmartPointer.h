#pragma once

#include <cstdint>
#include <memory>
#include <utility>

#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::Utilities::Tools {

/// Shared owner of one heap object. The count is not atomic: copies of one pointer must not be made or
/// dropped on two threads at once.
template <class T>
class SmartPointer final {
  public:
    SmartPointer() noexcept = default;
    /// Takes ownership of `object`; null gives an empty pointer. When there is no memory for the count,
    /// `object` is deleted before the exception leaves.
    explicit SmartPointer(T* object) {
        std::unique_ptr<T> guard(object);
        if (object) {
            count = new std::uint16_t(1);
            pointee = guard.release();
        }
    }
    SmartPointer(const SmartPointer& other) noexcept : count(other.count), pointee(other.pointee) {
        if (count) {
            ++*count;
        }
    }
    SmartPointer& operator=(const SmartPointer& other) noexcept {
        if (this != &other) {
            SmartPointer copy(other);
            std::swap(count, copy.count);
            std::swap(pointee, copy.pointee);
        }
        return *this;
    }
    ~SmartPointer() {
        if (count && --*count == 0) {
            delete pointee;
            delete count;
        }
    }

    /// Both operators throw `NullPointerException` on an empty pointer.
    T* operator->() const;
    T& operator*() const;

    bool IsEmpty() const noexcept { return pointee == nullptr; }
    T* Get() const noexcept { return pointee; }

  private:
    std::uint16_t* count = nullptr;
    T* pointee = nullptr;
};

template <class T>
T* SmartPointer<T>::operator->() const try {
    if (!pointee) {
        throw Exceptions::NullPointerException(pointee, Exceptions::Here());
    }
    return pointee;
}
TRACED

template <class T>
T& SmartPointer<T>::operator*() const try {
    if (!pointee) {
        throw Exceptions::NullPointerException(pointee, Exceptions::Here());
    }
    return *pointee;
}
TRACED

}  // namespace Varnholt::Utilities::Tools
