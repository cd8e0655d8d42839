#pragma once

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "Output/Rows.h"
#include "Session.h"

namespace Varnholt::Cli {

/// A value in a row: its text, and as JSON.
Rows::Cell CellOf(const DeviceDriver::Generic::Configuration::Property& value);
/// A raw word in hexadecimal digits, and as JSON.
Rows::Cell CellOfWord(std::uint32_t word);

/// How long vectors are shown: drawn, or as numbers.
enum class Vectors { Plotted, Numbers };

/// A table of identifiers and values; long vectors follow behind it, each under its identifier.
void PrintValues(Session& session, const DeviceDriver::Generic::Configuration::Properties& values,
                 Vectors vectors);

}  // namespace Varnholt::Cli
