#pragma once

#include <compare>
#include <cstdint>

#include "Utilities/Tools/SmartPointer.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {

struct PrecisionTimeImpl {
    std::int32_t seconds = 0;
    std::int32_t microseconds = 0;
    auto operator<=>(const PrecisionTimeImpl&) const = default;
};

/// Seconds and microseconds of the high-resolution counter; a normalised value has 0 to 999999 microseconds.
/// Each object owns its value. One thread at a time.
class PrecisionTime final {
  public:
    PrecisionTime() : PrecisionTime(0, 0) {}
    /// The fields as given, not normalised.
    PrecisionTime(std::int32_t seconds, std::int32_t microseconds);
    PrecisionTime(const PrecisionTime& other);
    PrecisionTime& operator=(const PrecisionTime& other);
    ~PrecisionTime() = default;

    void Set(std::int32_t seconds, std::int32_t microseconds);
    /// Reads the clock: the counter, which runs from 0 to 4294.967295 s and starts again, or without a
    /// counter the milliseconds since the system started.
    void SetToNow();
    /// What `SetToNow` makes of these readings; a frequency of 0 stands for no counter.
    void SetFromReadings(std::uint64_t frequency, std::uint64_t counter, std::uint32_t ticks);

    /// One carry or borrow is made: the operands are normalised.
    PrecisionTime& operator+=(const PrecisionTime& other);
    PrecisionTime& operator-=(const PrecisionTime& other);
    friend PrecisionTime operator+(const PrecisionTime& a, const PrecisionTime& b) {
        return PrecisionTime(a) += b;
    }
    friend PrecisionTime operator-(const PrecisionTime& a, const PrecisionTime& b) {
        return PrecisionTime(a) -= b;
    }
    friend bool operator==(const PrecisionTime& a, const PrecisionTime& b) { return *a.impl_ == *b.impl_; }
    friend auto operator<=>(const PrecisionTime& a, const PrecisionTime& b) { return *a.impl_ <=> *b.impl_; }

    std::int32_t GetSeconds() const { return impl_->seconds; }
    std::int32_t GetMilliseconds() const { return impl_->microseconds / 1000; }
    /// Within the millisecond.
    std::int32_t GetMicroseconds() const { return impl_->microseconds % 1000; }
    /// The time from this value until now.
    void GetElapsed(std::int32_t& seconds, std::int32_t& milliseconds, std::int32_t& microseconds) const;

  private:
    Varnholt::Utilities::Tools::SmartPointer<PrecisionTimeImpl> impl_;
};

}  // namespace Varnholt::DeviceDriver::Generic::Utilities
