#pragma once

#include "Platform/ErrorCodes.h"
#include "StandIn.h"

namespace Varnholt::Simulator {

inline constexpr Status StatusPending = 0x103;

/// The kernel's status that reaches the host's process as `code`.
Status KernelStatus(Platform::ErrorCode code);

}  // namespace Varnholt::Simulator
