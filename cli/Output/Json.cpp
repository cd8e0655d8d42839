#include "Output/Json.h"

#include <fmt/format.h>

#include <charconv>
#include <cmath>
#include <nlohmann/json.hpp>
#include <type_traits>

namespace Varnholt::Cli {

using DeviceDriver::Generic::Configuration::Properties;
using DeviceDriver::Generic::Configuration::Property;
using DeviceDriver::Generic::Configuration::TypeFloat;
using DeviceDriver::Generic::Configuration::TypeFloatVector;

/// The package's headers cost every source that includes them seconds: it is seen by this one only.
class JsonPrinter final {
  public:
    using Package = nlohmann::ordered_json;

    static Package Convert(const Json& json) {
        return std::visit([](const auto& value) { return Convert(value); }, json.value_);
    }

  private:
    static Package Convert(std::monostate) { return nullptr; }
    static Package Convert(const Json::Array& elements) {
        Package array = Package::array();
        for (const Json& element : elements) {
            array.push_back(Convert(element));
        }
        return array;
    }
    static Package Convert(const Json::Object& members) {
        Package object = Package::object();
        for (const auto& [name, value] : members) {
            object[name] = Convert(value);
        }
        return object;
    }
    template <class Scalar>
    static Package Convert(const Scalar& value) {
        return value;
    }
};

Json::Json(float number) {
    if (std::isfinite(number)) {
        const std::string text = fmt::format("{}", number);
        double shortest = 0;
        std::from_chars(text.data(), text.data() + text.size(), shortest);
        value_ = shortest;
    }
}

Json::Json(std::initializer_list<Member> members) : value_(Object(members)) {}
Json::Json(Array elements) : value_(std::move(elements)) {}
Json::Json(Object members) : value_(std::move(members)) {}

Json::Json(const Property& value) {
    const bool isFloat = value.GetType() == TypeFloat || value.GetType() == TypeFloatVector;
    const Json elements = isFloat ? Json(value.AsFloatVector()) : Json(value.AsLongVector());
    const auto& array = std::get<Array>(elements.value_);
    *this = array.size() == 1 ? array.front() : elements;
}

Json::Json(const Properties& values) : value_(Object()) {
    for (const auto& [id, value] : values.GetDatastore()) {
        Add(std::to_string(id), value);
    }
}

Json Json::OrNull(const std::string& text) {
    return text.empty() ? Json() : Json(text);
}

void Json::Add(std::string name, Json value) {
    if (value_.index() == 0) {
        value_ = Object();
    }
    std::get<Object>(value_).emplace_back(std::move(name), std::move(value));
}

void Json::Append(Json element) {
    if (value_.index() == 0) {
        value_ = Array();
    }
    std::get<Array>(value_).push_back(std::move(element));
}

void Json::AddAll(const Json& object) {
    for (const auto& [name, value] : std::get<Object>(object.value_)) {
        Add(name, value);
    }
}

std::string Json::Text() const {
    return JsonPrinter::Convert(*this).dump(-1, ' ', false, JsonPrinter::Package::error_handler_t::replace) +
           '\n';
}

}  // namespace Varnholt::Cli
