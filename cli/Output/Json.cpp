#include "Output/Json.h"

#include <fmt/format.h>

#include <charconv>
#include <cmath>
#include <ostream>

namespace Varnholt::Cli {

using DeviceDriver::Generic::Configuration::Property;
using DeviceDriver::Generic::Configuration::TypeFloat;
using DeviceDriver::Generic::Configuration::TypeFloatVector;

void PrintJson(std::ostream& stream, const Json& value) {
    stream << value.dump(-1, ' ', false, Json::error_handler_t::replace) << '\n';
}

Json JsonOf(float value) {
    if (!std::isfinite(value)) {
        return nullptr;
    }
    const std::string text = fmt::format("{}", value);
    double shortest = 0;
    std::from_chars(text.data(), text.data() + text.size(), shortest);
    return shortest;
}

Json JsonOf(const Property& value) {
    Json elements = Json::array();
    if (value.GetType() == TypeFloat || value.GetType() == TypeFloatVector) {
        for (const float element : value.AsFloatVector()) {
            elements.push_back(JsonOf(element));
        }
    } else {
        for (const std::int32_t element : value.AsLongVector()) {
            elements.push_back(element);
        }
    }
    return elements.size() == 1 ? elements.front() : elements;
}

}  // namespace Varnholt::Cli
