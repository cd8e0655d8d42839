#pragma once

#include <cstddef>
#include <cstdint>
#include <numeric>
#include <string>
#include <vector>

namespace Varnholt::Tests {

using Bytes = std::vector<std::uint8_t>;

/// `count` bytes that tell their place: first, first + 1, ...
inline Bytes Counting(std::size_t count, unsigned first = 0) {
    Bytes bytes(count);
    std::iota(bytes.begin(), bytes.end(), static_cast<std::uint8_t>(first));
    return bytes;
}

/// One behind the other.
template <class... Parts>
Bytes Join(const Parts&... parts) {
    Bytes all;
    (all.insert(all.end(), parts.begin(), parts.end()), ...);
    return all;
}

/// An image whose pieces differ.
inline Bytes CountingImage(unsigned first = 0, std::size_t size = 8192) {
    Bytes image(size);
    for (std::size_t i = 0; i < image.size(); ++i) {
        image[i] = static_cast<std::uint8_t>(i * 7 + i / 256 + first);
    }
    return image;
}

/// "1F 00 A2"
inline std::string Hex(const std::uint8_t* bytes, std::size_t count) {
    std::string text;
    for (std::size_t i = 0; i < count; ++i) {
        text += i > 0 ? " " : "";
        text += "0123456789ABCDEF"[bytes[i] >> 4];
        text += "0123456789ABCDEF"[bytes[i] & 0x0F];
    }
    return text;
}

}  // namespace Varnholt::Tests
