#include "Output/WallTimeText.h"

#include <fmt/format.h>

#include <chrono>
#include <cstdlib>

namespace Varnholt::Cli {

std::string WallTimeText(const Platform::WallTime& time) {
    using namespace std::chrono;
    const Platform::CalendarTime local = Platform::LocalCalendarTime(time.seconds);
    const sys_days day = year(local.year) / local.month / local.day;
    const auto asUtc =
        day.time_since_epoch() + hours(local.hour) + minutes(local.minute) + seconds(local.second);
    const std::int64_t ahead = duration_cast<minutes>(asUtc - seconds(time.seconds)).count();
    return fmt::format("{:04}-{:02}-{:02}T{:02}:{:02}:{:02}.{:03}{}{:02}:{:02}", local.year, local.month,
                       local.day, local.hour, local.minute, local.second, time.milliseconds,
                       ahead < 0 ? '-' : '+', std::abs(ahead) / 60, std::abs(ahead) % 60);
}

}  // namespace Varnholt::Cli
