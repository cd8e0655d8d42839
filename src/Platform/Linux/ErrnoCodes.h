#pragma once

#include "Platform/ErrorCodes.h"

namespace Varnholt::Platform::Linux {

/// The code of `Errors` for a value of `errno`; what has no counterpart is `Errors::GeneralFailure`.
ErrorCode CodeOf(int errnoValue);

}  // namespace Varnholt::Platform::Linux
