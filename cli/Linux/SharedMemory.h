#pragma once

#include <optional>

#include "Failure.h"

namespace Varnholt::Cli {

/// Makes a lock such as an instrument's in the machine's shared memory, and lets go of it; tells of the
/// failure.
std::optional<FailureReport> TryLocks();

}  // namespace Varnholt::Cli
