#pragma once

#include <vector>

#include "Finding.h"

namespace Varnholt::Cli {

/// `Diagnose` where kernel drivers stand between the library and the instruments: looks at the interfaces of
/// both drivers. Takes up to 8 seconds for an instrument whose lock another process keeps.
std::vector<Finding> DiagnoseDrivers(Session& session);

}  // namespace Varnholt::Cli
