#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <string>

namespace Varnholt::Service {

/// A whole number of at most `limit`, decimal or 0x...; nothing else may stand around it. Leading zeros mean
/// nothing. None where the text is something else.
std::optional<std::uint64_t> ParseNumber(const std::string& text, std::uint64_t limit);
template <class Integer>
std::optional<Integer> ParseNumber(const std::string& text) {
    return ParseNumber(text, std::numeric_limits<Integer>::max());
}

/// The text in lower case, where it is so many hexadecimal digits and nothing else.
std::optional<std::string> ParseHexadecimal(std::string text, std::size_t digits);

}  // namespace Varnholt::Service
