#pragma once

#include <vector>

#include "Service/Finding.h"

namespace Varnholt::Service {

/// `Diagnose` where kernel drivers stand between the library and the instruments: looks at the interfaces of
/// both drivers. Takes up to 8 seconds for an instrument whose lock another process keeps.
std::vector<Finding> DiagnoseDrivers(Context& context);

}  // namespace Varnholt::Service
