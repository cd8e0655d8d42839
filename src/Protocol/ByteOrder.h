#pragma once

#include <cstdint>

/// Byte order of the numbers on the wire. The caller supplies enough bytes.
namespace Varnholt::Protocol {

inline void StoreLittle16(std::uint8_t* bytes, std::uint16_t value) {
    bytes[0] = static_cast<std::uint8_t>(value);
    bytes[1] = static_cast<std::uint8_t>(value >> 8);
}
inline void StoreLittle32(std::uint8_t* bytes, std::uint32_t value) {
    StoreLittle16(bytes, static_cast<std::uint16_t>(value));
    StoreLittle16(bytes + 2, static_cast<std::uint16_t>(value >> 16));
}
inline std::uint16_t LoadLittle16(const std::uint8_t* bytes) {
    return static_cast<std::uint16_t>(bytes[0] | bytes[1] << 8);
}
inline std::uint32_t LoadLittle32(const std::uint8_t* bytes) {
    return LoadLittle16(bytes) | static_cast<std::uint32_t>(LoadLittle16(bytes + 2)) << 16;
}
inline void StoreBig16(std::uint8_t* bytes, std::uint16_t value) {
    bytes[0] = static_cast<std::uint8_t>(value >> 8);
    bytes[1] = static_cast<std::uint8_t>(value);
}
inline void StoreBig32(std::uint8_t* bytes, std::uint32_t value) {
    StoreBig16(bytes, static_cast<std::uint16_t>(value >> 16));
    StoreBig16(bytes + 2, static_cast<std::uint16_t>(value));
}
inline std::uint16_t LoadBig16(const std::uint8_t* bytes) {
    return static_cast<std::uint16_t>(bytes[0] << 8 | bytes[1]);
}
inline std::uint32_t LoadBig32(const std::uint8_t* bytes) {
    return static_cast<std::uint32_t>(LoadBig16(bytes)) << 16 | LoadBig16(bytes + 2);
}

}  // namespace Varnholt::Protocol
