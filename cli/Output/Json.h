#pragma once

#include <cstdint>
#include <iosfwd>
#include <nlohmann/json.hpp>
#include <string>

#include "DeviceDriver/Generic/Configuration/Property.h"

namespace Varnholt::Cli {

/// Members keep the order in which they were added, so that the output is stable.
using Json = nlohmann::ordered_json;

/// One line. Bytes that are no UTF-8 (a path can hold any) are replaced.
void PrintJson(std::ostream& stream, const Json& value);

/// With the digits that the float needs and no more; null where it is no number.
Json JsonOf(float value);
/// A number, or an array where the value has another number of elements than one.
Json JsonOf(const DeviceDriver::Generic::Configuration::Property& value);

}  // namespace Varnholt::Cli
