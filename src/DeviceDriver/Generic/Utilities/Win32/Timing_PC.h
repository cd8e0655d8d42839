#pragma once

#include "DeviceDriver/Generic/Utilities/Timing.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {

/// The clock of the host computer. Obtain it with `Timing::Instance`.
class Timing_PC : public Timing {
  public:
    using Timing::operator=;
    void DeviceDriverSleep(std::uint32_t milliseconds) override;
    ActualTime GetActualTime() override;
    double GetDiffTime(const ActualTime& earlier) override;
    std::uint32_t GetActualTimeStamp() override;
};

}  // namespace Varnholt::DeviceDriver::Generic::Utilities
