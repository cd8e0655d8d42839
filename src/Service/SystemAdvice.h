#pragma once

#include <string>

#include "Platform/ErrorCodes.h"
#include "Service/Failure.h"

/// What the user can do next, and be told, with this system's means.
namespace Varnholt::Service {

/// Where no instrument is found.
extern const char* const NoInstrumentAdvice;

/// Why the system refuses the lock of an instrument, and what to do: `code` is what `MakeMutex` left.
Failure DescribeMissingLock(Platform::ErrorCode code);

/// Which other process uses the instrument, as "NAME (process NUMBER)"; empty where that cannot be seen.
std::string HolderOf(const std::string& identifier);

}  // namespace Varnholt::Service
