#include "DeviceDriver/Generic/Utilities/Timing.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {

Timing& Timing::operator=(const Timing&) {  // NOLINT(misc-unconventional-assign-operator)
    return *this;
}

std::int32_t Timing::GetEpochSeconds(const ActualTime& time) {
    return time.seconds;
}

ActualTime& Timing::SetEpochSeconds(std::int32_t seconds, ActualTime& time) {
    time.seconds = seconds;
    return time;
}

}  // namespace Varnholt::DeviceDriver::Generic::Utilities
