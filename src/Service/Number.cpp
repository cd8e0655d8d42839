#include "Service/Number.h"

#include <algorithm>
#include <cctype>
#include <charconv>

namespace Varnholt::Service {

std::optional<std::uint64_t> ParseNumber(const std::string& text, std::uint64_t limit) {
    const bool isHexadecimal = text.starts_with("0x") || text.starts_with("0X");
    const char* const first = text.data() + (isHexadecimal ? 2 : 0);
    const char* const end = text.data() + text.size();
    std::uint64_t number = 0;
    const auto parsed = std::from_chars(first, end, number, isHexadecimal ? 16 : 10);
    const bool isNumber = parsed.ec == std::errc() && parsed.ptr == end && number <= limit;
    return isNumber ? std::optional(number) : std::nullopt;
}

std::optional<std::string> ParseHexadecimal(std::string text, std::size_t digits) {
    if (text.size() != digits ||
        !std::ranges::all_of(text, [](unsigned char c) { return std::isxdigit(c) != 0; })) {
        return std::nullopt;
    }
    std::ranges::transform(text, text.begin(),
                           [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return text;
}

}  // namespace Varnholt::Service
