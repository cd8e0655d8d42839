#include "Service/Number.h"

#include <charconv>

namespace Varnholt::Service {

bool ParseNumber(const std::string& text, std::uint64_t limit, std::uint64_t& number) {
    const bool isHexadecimal = text.starts_with("0x") || text.starts_with("0X");
    const char* const first = text.data() + (isHexadecimal ? 2 : 0);
    const char* const end = text.data() + text.size();
    const auto parsed = std::from_chars(first, end, number, isHexadecimal ? 16 : 10);
    return parsed.ec == std::errc() && parsed.ptr == end && number <= limit;
}

}  // namespace Varnholt::Service
