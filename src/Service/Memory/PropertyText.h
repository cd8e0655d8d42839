#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "DeviceDriver/Generic/Configuration/Property.h"

namespace Varnholt::Service {

using DeviceDriver::Generic::Configuration::Property;

/// "5", "0.5, -1", "(empty)"; without a locale, with as many digits as the value needs.
std::string TextOf(const Property& value);
/// The elements as numbers, for a plot.
std::vector<double> NumbersOf(const Property& value);
/// Whether the value is a list that is better drawn than printed.
bool IsLongVector(const Property& value);

/// "ID=VALUE" or "ID=VALUE,VALUE..." of a command line.
struct Assignment {
    std::uint16_t id;
    std::string value;
};
/// `FailureKind::BadArgument` where the text is none.
Assignment ParseAssignment(const std::string& text);
std::vector<Assignment> ParseAssignments(const std::vector<std::string>& texts);

/// The assignment's value with the type and number of elements of `pattern`; `FailureKind::BadArgument`
/// where it does not fit. Integers may be written as 0x..., floats must be finite.
Property ParseValue(const Assignment& assignment, const Property& pattern);

}  // namespace Varnholt::Service
