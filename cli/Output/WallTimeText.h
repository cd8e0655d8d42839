#pragma once

#include <string>

#include "Platform/Time.h"

namespace Varnholt::Cli {

/// "2026-11-26T01:40:32.123+01:00": local time and how far it is ahead of UTC.
std::string WallTimeText(const Platform::WallTime& time);

}  // namespace Varnholt::Cli
