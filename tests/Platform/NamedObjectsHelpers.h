#pragma once

#include <vector>

#include "Support/HelperProcess.h"

namespace Varnholt::Platform {

/// What the tests of named objects have done in processes of its own; see there.
std::vector<TestSupport::Helper> NamedObjectsHelpers();

}  // namespace Varnholt::Platform
