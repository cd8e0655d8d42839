#pragma once

#include <utility>

namespace Varnholt::Platform {

/// Owns what the value names, and closes it; `None` names nothing.
template <class Value, Value None, auto CloseValue>
class Owned final {
  public:
    Owned() = default;
    explicit Owned(Value owned) : value_(owned) {}
    Owned(Owned&& other) noexcept : value_(other.Release()) {}
    Owned& operator=(Owned&& other) noexcept {
        std::swap(value_, other.value_);
        return *this;
    }
    ~Owned() { Reset(); }

    Value Get() const { return value_; }
    explicit operator bool() const { return value_ != None; }
    /// What it names is the caller's from here on.
    Value Release() { return std::exchange(value_, None); }
    void Reset() {
        if (value_ != None) {
            CloseValue(Release());
        }
    }

  private:
    Value value_ = None;
};

}  // namespace Varnholt::Platform
