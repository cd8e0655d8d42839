#pragma once

#include <cstdint>
#include <vector>

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "Service/Memory/PropertyText.h"

namespace Varnholt::Service {

/// The parameters in the instrument's RAM, as `RamAccess` loads and stores them.

/// What a parameter means, in a few words.
const char* MeaningOfParameter(std::uint16_t id);

/// The loaded set with these new values. `Failure` for what cannot be set, and for what the instrument would
/// take for something else: it knows no signs, and what has fewer bits or a limit would be cut off without a
/// word.
DeviceDriver::Generic::Configuration::Properties WithParameters(
    const DeviceDriver::Generic::Configuration::Properties& loaded,
    const std::vector<Assignment>& assignments);

/// What to show of a change: what was asked for, then what has changed with it, as a mode rounds all times
/// anew.
std::vector<std::uint16_t> ParametersToShow(const std::vector<Assignment>& assignments,
                                            const DeviceDriver::Generic::Configuration::Properties& before,
                                            const DeviceDriver::Generic::Configuration::Properties& after);

}  // namespace Varnholt::Service
