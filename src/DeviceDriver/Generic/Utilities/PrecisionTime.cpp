#include "DeviceDriver/Generic/Utilities/PrecisionTime.h"

#include <cmath>

#include "Platform/Time.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {
namespace {

constexpr std::int32_t MicrosecondsPerSecond = 1000000;
constexpr double CounterRange = 4294967296.0;  // microseconds are kept in 32 bits

const std::uint64_t counterFrequency = Platform::PerformanceFrequency();

// Seconds wrap: values from outside may be anything.
std::int32_t Sum(std::int32_t a, std::int32_t b) {
    return static_cast<std::int32_t>(static_cast<std::uint32_t>(a) + static_cast<std::uint32_t>(b));
}
std::int32_t Difference(std::int32_t a, std::int32_t b) {
    return static_cast<std::int32_t>(static_cast<std::uint32_t>(a) - static_cast<std::uint32_t>(b));
}

}  // namespace

PrecisionTime::PrecisionTime(std::int32_t seconds, std::int32_t microseconds)
    : impl_(new PrecisionTimeImpl{seconds, microseconds}) {}

PrecisionTime::PrecisionTime(const PrecisionTime& other) : impl_(new PrecisionTimeImpl(*other.impl_)) {}

PrecisionTime& PrecisionTime::operator=(const PrecisionTime& other) {
    *impl_ = *other.impl_;
    return *this;
}

void PrecisionTime::Set(std::int32_t seconds, std::int32_t microseconds) {
    *impl_ = {seconds, microseconds};
}

void PrecisionTime::SetToNow() {
    SetFromReadings(counterFrequency, Platform::PerformanceCounter(), Platform::TickCount());
}

void PrecisionTime::SetFromReadings(std::uint64_t frequency, std::uint64_t counter, std::uint32_t ticks) {
    if (frequency != 0) {
        const double elapsed =
            std::trunc(static_cast<double>(counter) * MicrosecondsPerSecond / static_cast<double>(frequency));
        const auto microseconds = static_cast<std::uint32_t>(std::fmod(elapsed, CounterRange));
        Set(static_cast<std::int32_t>(microseconds / MicrosecondsPerSecond),
            static_cast<std::int32_t>(microseconds % MicrosecondsPerSecond));
    } else {
        const auto signedTicks = static_cast<std::int32_t>(ticks);
        Set(signedTicks / 1000, signedTicks % 1000 * 1000);
    }
}

PrecisionTime& PrecisionTime::operator+=(const PrecisionTime& other) {
    impl_->seconds = Sum(impl_->seconds, other.impl_->seconds);
    impl_->microseconds = Sum(impl_->microseconds, other.impl_->microseconds);
    if (impl_->microseconds >= MicrosecondsPerSecond) {
        impl_->seconds = Sum(impl_->seconds, 1);
        impl_->microseconds -= MicrosecondsPerSecond;
    }
    return *this;
}

PrecisionTime& PrecisionTime::operator-=(const PrecisionTime& other) {
    impl_->seconds = Difference(impl_->seconds, other.impl_->seconds);
    impl_->microseconds = Difference(impl_->microseconds, other.impl_->microseconds);
    if (impl_->microseconds < 0) {
        impl_->seconds = Difference(impl_->seconds, 1);
        impl_->microseconds += MicrosecondsPerSecond;
    }
    return *this;
}

void PrecisionTime::GetElapsed(std::int32_t& seconds, std::int32_t& milliseconds,
                               std::int32_t& microseconds) const {
    PrecisionTime elapsed;
    elapsed.SetToNow();
    elapsed -= *this;
    seconds = elapsed.GetSeconds();
    milliseconds = elapsed.GetMilliseconds();
    microseconds = elapsed.GetMicroseconds();
}

}  // namespace Varnholt::DeviceDriver::Generic::Utilities
