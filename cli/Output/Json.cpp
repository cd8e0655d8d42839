#include "Output/Json.h"

#include <fmt/format.h>

#include <charconv>
#include <cmath>
#include <nlohmann/json.hpp>

namespace Varnholt::Cli {
namespace {

using DeviceDriver::Generic::Configuration::Properties;
using DeviceDriver::Generic::Configuration::Property;

/// The package's headers cost every source that includes them seconds: it is seen by this one only.
std::string Dumped(const nlohmann::json& value) {
    return value.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
}

template <class Number>
Json JsonOf(const std::vector<Number>& elements) {
    return elements.size() == 1 ? Json(elements.front()) : Json(elements);
}

}  // namespace

Json::Json(double number) : text_(Dumped(number)) {}

Json::Json(float number) {
    if (std::isfinite(number)) {
        const std::string text = fmt::format("{}", number);
        double shortest = 0;
        std::from_chars(text.data(), text.data() + text.size(), shortest);
        text_ = Dumped(shortest);
    }
}

Json::Json(const std::string& text) : text_(Dumped(text)) {}

Json::Json(std::initializer_list<Member> members) : text_(EmptyObject) {
    for (const auto& [name, value] : members) {
        Add(name, value);
    }
}

Json::Json(const Property& value)
    : Json(value.AsLongVector().empty() ? JsonOf(value.AsFloatVector()) : JsonOf(value.AsLongVector())) {}

Json::Json(const Properties& values) : text_(EmptyObject) {
    for (const auto& [id, value] : values.GetDatastore()) {
        Add(std::to_string(id), value);
    }
}

/// In front of the bracket that closes this value, which is `empty` if it was null.
void Json::Insert(const std::string& element, const char* empty) {
    if (text_ == Null) {
        text_ = empty;
    }
    const std::string comma = text_ == empty ? "" : ",";
    text_.insert(text_.size() - 1, comma + element);
}

void Json::Add(const std::string& name, const Json& value) {
    Insert(Dumped(name) + ":" + value.text_, EmptyObject);
}

void Json::Append(const Json& element) {
    Insert(element.text_, EmptyArray);
}

}  // namespace Varnholt::Cli
