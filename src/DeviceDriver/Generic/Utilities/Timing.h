#pragma once

#include <cstdint>

#include "Utilities/Tools/SmartPointer.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {

/// A point in time: the calendar fields are local time, `seconds` is the same instant counted since
/// 1970-01-01 00:00:00 UTC.
struct ActualTime {
    std::uint16_t year;
    std::uint8_t month;  ///< 1 to 12
    std::uint8_t day;    ///< 1 to 31
    std::uint8_t hour;
    std::uint8_t minute;
    std::uint8_t second;
    std::uint16_t milliseconds;
    std::int32_t seconds;
};

/// The driver's clock services. Without state: any thread may use an object.
class Timing {
  public:
    Timing() = default;
    Timing(const Timing&) = default;
    virtual ~Timing() = default;
    /// There is nothing to assign; answers this object.
    virtual Timing& operator=(const Timing& other);  // NOLINT(misc-unconventional-assign-operator)

    /// Suspends the calling thread; 0 gives up the rest of its time slice.
    virtual void DeviceDriverSleep(std::uint32_t milliseconds) = 0;
    virtual ActualTime GetActualTime() = 0;
    /// Seconds from `earlier` until now.
    virtual double GetDiffTime(const ActualTime& earlier) = 0;
    /// The low 32 bits of the seconds since 1970-01-01 00:00:00 UTC.
    virtual std::uint32_t GetActualTimeStamp() = 0;
    virtual std::int32_t GetEpochSeconds(const ActualTime& time);
    virtual ActualTime& SetEpochSeconds(std::int32_t seconds, ActualTime& time);

    /// A new object with each call, for this host.
    static Varnholt::Utilities::Tools::SmartPointer<Timing> Instance();
};

}  // namespace Varnholt::DeviceDriver::Generic::Utilities
