#pragma once

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "Session.h"

namespace Varnholt::Cli {

/// How long vectors are shown: drawn, or as numbers.
enum class Vectors { Plotted, Numbers };

/// A table of identifiers and values; long vectors follow behind it, each under its identifier.
void PrintValues(Session& session, const DeviceDriver::Generic::Configuration::Properties& values,
                 Vectors vectors);

}  // namespace Varnholt::Cli
