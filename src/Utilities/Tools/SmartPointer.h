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
            count_ = new std::uint16_t(1);
            pointee_ = guard.release();
        }
    }
    SmartPointer(const SmartPointer& other) noexcept : count_(other.count_), pointee_(other.pointee_) {
        if (count_) {
            ++*count_;
        }
    }
    SmartPointer& operator=(const SmartPointer& other) noexcept {
        if (this != &other) {
            SmartPointer copy(other);
            std::swap(count_, copy.count_);
            std::swap(pointee_, copy.pointee_);
        }
        return *this;
    }
    ~SmartPointer() {
        if (count_ && --*count_ == 0) {
            delete pointee_;
            delete count_;
        }
    }

    /// Both operators throw `NullPointerException` on an empty pointer.
    T* operator->() const;
    T& operator*() const;

    bool IsEmpty() const noexcept { return pointee_ == nullptr; }
    T* Get() const noexcept { return pointee_; }

  private:
    std::uint16_t* count_ = nullptr;
    T* pointee_ = nullptr;
};

template <class T>
T* SmartPointer<T>::operator->() const try {
    if (!pointee_) {
        throw Exceptions::NullPointerException(pointee_, Exceptions::Here());
    }
    return pointee_;
}
TRACED

template <class T>
T& SmartPointer<T>::operator*() const try {
    if (!pointee_) {
        throw Exceptions::NullPointerException(pointee_, Exceptions::Here());
    }
    return *pointee_;
}
TRACED

}  // namespace Varnholt::Utilities::Tools
