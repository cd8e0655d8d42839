#pragma once

#include <cstdint>
#include <string>

namespace Varnholt::Service {

/// A whole number of at most `limit`, decimal or 0x...; nothing else may stand around it. Leading zeros mean
/// nothing.
bool ParseNumber(const std::string& text, std::uint64_t limit, std::uint64_t& number);

}  // namespace Varnholt::Service
