#pragma once

#include <string>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"

namespace Varnholt::Interface {

/// Opens the connected instrument whose identifier (the path of its device interface) equals `name` byte for
/// byte; an empty name takes the first that can be opened. Instruments before the match are opened, reset and
/// closed again; those that cannot be opened are passed over. Throws `RuntimeException` with an empty message
/// when none matches.
Utilities::Tools::SmartPointer<DeviceDriver::Ostra::LowLevel::PellandoFunctionality> OpenInstrumentByName(
    const std::string& name);

}  // namespace Varnholt::Interface
