#pragma once

#include <cstdint>
#include <span>
#include <string>

namespace Varnholt::Capture {

/// What a vendor request says, for people: "SetMeasureParameters p1=294 p2=0 p3=1 p4=6". `data` is its data
/// stage as far as it is known (out: the bytes sent; in: the bytes received, empty before). A request that
/// the instrument does not have reads "vendor request 0x99".
std::string DescribeRequest(std::uint8_t request, std::uint16_t value, std::span<const std::uint8_t> data);

/// Data that have moved over another endpoint: "bulk in 256 of 256".
std::string DescribeData(std::uint8_t endpoint, std::uint32_t moved, std::uint32_t asked);

/// So many upper-case digits, without a prefix.
std::string Hexadecimal(std::uint32_t value, int digits);

}  // namespace Varnholt::Capture
