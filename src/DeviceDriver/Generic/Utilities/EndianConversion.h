#pragma once

#include <cstdint>

/// Numbers as bytes, in either order: with `bigEndian` the most significant byte comes first. The caller
/// supplies 2 or 4 bytes; nothing is checked. Floats travel as their IEEE 754 single-precision bit pattern.
namespace Varnholt::DeviceDriver::Generic::Utilities::EndianConversion {

void ShortToByteArray(std::uint16_t value, std::uint8_t* bytes, bool bigEndian);
void ShortToByteArray(std::int16_t value, std::uint8_t* bytes, bool bigEndian);
void LongToByteArray(std::uint32_t value, std::uint8_t* bytes, bool bigEndian);
void LongToByteArray(std::int32_t value, std::uint8_t* bytes, bool bigEndian);
/// By reference: where floats pass through an x87 register on their way, some bit patterns of no number
/// change.
void FloatToByteArray(const float& value, std::uint8_t* bytes, bool bigEndian);

void ByteArrayToShort(const std::uint8_t* bytes, std::uint16_t& value, bool bigEndian);
void ByteArrayToShort(const std::uint8_t* bytes, std::int16_t& value, bool bigEndian);
void ByteArrayToLong(const std::uint8_t* bytes, std::uint32_t& value, bool bigEndian);
void ByteArrayToLong(const std::uint8_t* bytes, std::int32_t& value, bool bigEndian);
void ByteArrayToFloat(const std::uint8_t* bytes, float& value, bool bigEndian);

}  // namespace Varnholt::DeviceDriver::Generic::Utilities::EndianConversion
