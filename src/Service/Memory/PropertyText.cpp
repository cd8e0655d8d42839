#include "Service/Memory/PropertyText.h"

#include <fmt/format.h>

#include <algorithm>
#include <charconv>
#include <cmath>
#include <iterator>
#include <limits>

#include "Service/Failure.h"
#include "Service/Number.h"

namespace Varnholt::Service {
namespace {

using namespace DeviceDriver::Generic::Configuration;

constexpr std::size_t ShortestLongVector = 16;

bool IsFloat(const Property& value) {
    return value.GetType() == TypeFloat || value.GetType() == TypeFloatVector;
}

std::size_t ElementsOf(const Property& value) {
    return value.SizeOf() / Property::ElementSize;
}

/// Blanks around an element are not part of it; one inside stays, and makes it no number.
std::vector<std::string> SplitAtCommas(const std::string& text) {
    std::vector<std::string> parts;
    for (std::size_t at = 0; at <= text.size();) {
        const std::size_t comma = std::min(text.find(',', at), text.size());
        const std::string part = text.substr(at, comma - at);
        const std::size_t first = std::min(part.find_first_not_of(' '), part.size());
        parts.push_back(part.substr(first, part.find_last_not_of(' ') + 1 - first));
        at = comma + 1;
    }
    return parts;
}

[[noreturn]] void Refuse(const Assignment& assignment, const std::string& part, const char* expected) {
    throw Failure(FailureKind::BadArgument,
                  fmt::format("{}={}: '{}' is no {}", assignment.id, assignment.value, part, expected));
}

float ParseFloat(const Assignment& assignment, const std::string& part) {
    float number = 0;
    const char* const end = part.data() + part.size();
    const auto parsed = std::from_chars(part.data(), end, number);
    if (parsed.ec != std::errc() || parsed.ptr != end || !std::isfinite(number)) {
        Refuse(assignment, part, "number that a 32-bit float holds");
    }
    return number;
}

std::int32_t ParseLong(const Assignment& assignment, const std::string& part) {
    const bool isNegative = part.starts_with('-');
    constexpr std::uint64_t most = std::numeric_limits<std::int32_t>::max();
    // Hexadecimal numbers name a bit pattern and may have the top bit set.
    const std::uint64_t limit = isNegative               ? most + 1
                                : part.starts_with("0x") ? std::numeric_limits<std::uint32_t>::max()
                                                         : most;
    const auto number = ParseNumber(isNegative ? part.substr(1) : part, limit);
    if (!number) {
        Refuse(assignment, part, "32-bit integer");
    }
    const auto bits = static_cast<std::uint32_t>(*number);
    return static_cast<std::int32_t>(isNegative ? 0U - bits : bits);
}

}  // namespace

std::string TextOf(const Property& value) {
    if (ElementsOf(value) == 0) {
        return "(empty)";
    }
    return IsFloat(value) ? fmt::format("{}", fmt::join(value.AsFloatVector(), ", "))
                          : fmt::format("{}", fmt::join(value.AsLongVector(), ", "));
}

std::vector<double> NumbersOf(const Property& value) {
    const auto& floats = value.AsFloatVector();
    const auto& longs = value.AsLongVector();
    return IsFloat(value) ? std::vector<double>(floats.begin(), floats.end())
                          : std::vector<double>(longs.begin(), longs.end());
}

bool IsLongVector(const Property& value) {
    return ElementsOf(value) >= ShortestLongVector;
}

Assignment ParseAssignment(const std::string& text) {
    const std::size_t equals = text.find('=');
    const auto id = ParseNumber<std::uint16_t>(text.substr(0, equals));
    if (equals == std::string::npos || equals + 1 == text.size() || !id) {
        throw Failure(FailureKind::BadArgument, "'" + text + "' is no ID=VALUE",
                      "for example 1211=5, or 1000=0.5,1.5 for a value of two elements");
    }
    return {*id, text.substr(equals + 1)};
}

std::vector<Assignment> ParseAssignments(const std::vector<std::string>& texts) {
    std::vector<Assignment> assignments;
    std::ranges::transform(texts, std::back_inserter(assignments), ParseAssignment);
    return assignments;
}

Property ParseValue(const Assignment& assignment, const Property& pattern) {
    const std::vector<std::string> parts = SplitAtCommas(assignment.value);
    if (parts.size() != ElementsOf(pattern)) {
        throw Failure(FailureKind::BadArgument,
                      fmt::format("{} has {} element{}, not {}", assignment.id, ElementsOf(pattern),
                                  ElementsOf(pattern) == 1 ? "" : "s", parts.size()),
                      "elements are separated by commas");
    }
    Property value = pattern;
    const auto assign = [&](auto parse) {
        std::vector<decltype(parse(assignment, parts.front()))> numbers;
        std::ranges::transform(parts, std::back_inserter(numbers),
                               [&](const std::string& part) { return parse(assignment, part); });
        value.AssignInternal(numbers, pattern.GetType());
    };
    IsFloat(pattern) ? assign(ParseFloat) : assign(ParseLong);
    return value;
}

}  // namespace Varnholt::Service
