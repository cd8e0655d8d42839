#pragma once

#include <concepts>
#include <cstdint>
#include <initializer_list>
#include <iosfwd>
#include <ranges>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "DeviceDriver/Generic/Configuration/Properties.h"

namespace Varnholt::Cli {

template <class Range>
concept JsonElements =
    std::ranges::input_range<const Range> && !std::convertible_to<const Range&, std::string_view>;

/// A value that is printed as JSON. Made from what it is to hold: nothing (null), a truth value, a number, a
/// text, a range of values (an array), or names with values (an object, whose members keep their order, so
/// that the output is stable).
class Json final {
  public:
    using Array = std::vector<Json>;
    using Member = std::pair<std::string, Json>;
    using Object = std::vector<Member>;

    Json() = default;
    Json(bool truth) : value_(truth) {}
    template <std::integral Integer>
    Json(Integer number) : value_(static_cast<std::int64_t>(number)) {}
    Json(double number) : value_(number) {}
    /// With the digits that the float needs and no more; null where it is no number.
    Json(float number);
    Json(const char* text) : value_(std::string(text)) {}
    Json(std::string text) : value_(std::move(text)) {}
    Json(std::initializer_list<Member> members);
    Json(Array elements);
    Json(Object members);
    template <JsonElements Range>
    Json(const Range& elements) : value_(Array(elements.begin(), elements.end())) {}
    /// A number, or an array where the value has another number of elements than one.
    Json(const DeviceDriver::Generic::Configuration::Property& value);
    /// {"1000": [0.5, 1.5], "1211": 5, ...}
    Json(const DeviceDriver::Generic::Configuration::Properties& values);

    /// A text, or null where it is empty.
    static Json OrNull(const std::string& text);

    /// Of an object, which null becomes.
    void Add(std::string name, Json value);
    /// Of an array, which null becomes.
    void Append(Json element);
    /// Adds the members of an object to this one.
    void AddAll(const Json& object);

    /// One line. Bytes that are no UTF-8 (a path can hold any) are replaced.
    std::string Text() const;

  private:
    friend class JsonPrinter;

    std::variant<std::monostate, bool, std::int64_t, double, std::string, Array, Object> value_;
};

}  // namespace Varnholt::Cli
