#pragma once

#include <concepts>
#include <cstdint>
#include <initializer_list>
#include <ranges>
#include <string>
#include <string_view>
#include <utility>

#include "DeviceDriver/Generic/Configuration/Properties.h"

namespace Varnholt::Cli {

template <class Range>
concept JsonElements =
    std::ranges::input_range<const Range> && !std::convertible_to<const Range&, std::string_view>;

/// A value as JSON, whose text grows with what is added. Made from what it is to hold: nothing (null), a
/// truth value, a number, a text, a range of values (an array), or names with values (an object, whose
/// members keep their order, so that the output is stable).
class Json final {
  public:
    using Member = std::pair<std::string, Json>;

    Json() = default;
    Json(bool truth) : text_(truth ? "true" : "false") {}
    template <std::integral Integer>
    Json(Integer number) : text_(std::to_string(number)) {}
    Json(double number);
    /// With the digits that the float needs and no more; null where it is no number.
    Json(float number);
    /// Bytes that are no UTF-8 (a path can hold any) are replaced.
    Json(const std::string& text);
    Json(const char* text) : Json(std::string(text)) {}
    Json(std::initializer_list<Member> members);
    template <JsonElements Range>
    Json(const Range& elements) : text_(EmptyArray) {
        for (const auto& element : elements) {
            Append(element);
        }
    }
    /// A number, or an array where the value has another number of elements than one.
    Json(const DeviceDriver::Generic::Configuration::Property& value);
    /// {"1000": [0.5, 1.5], "1211": 5, ...}
    Json(const DeviceDriver::Generic::Configuration::Properties& values);

    static Json Array() { return std::initializer_list<int>(); }
    static Json Object() { return std::initializer_list<Member>(); }
    /// A text, or null where it is empty.
    static Json OrNull(const std::string& text) { return text.empty() ? Json() : Json(text); }

    /// Of an object, which null becomes. No name is added twice.
    void Add(const std::string& name, const Json& value);
    /// Of an array, which null becomes.
    void Append(const Json& element);

    /// One line.
    std::string Text() const { return text_ + '\n'; }

  private:
    static constexpr const char* Null = "null";
    static constexpr const char* EmptyArray = "[]";
    static constexpr const char* EmptyObject = "{}";

    void Insert(const std::string& element, const char* empty);

    std::string text_ = Null;
};

}  // namespace Varnholt::Cli
