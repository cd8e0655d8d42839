#pragma once

#include <cstdint>

#include "Platform/HostQueries.h"

/// For `Overrides.cpp`: what the system itself answers and does, where no test has taken its place.
namespace Varnholt::Platform {

VersionRecord ReadSystemVersion();
void SoundSystemBeep(std::uint32_t hertz, std::uint32_t milliseconds);

}  // namespace Varnholt::Platform
