#include "DeviceDriver/Generic/Utilities/EndianConversion.h"

#include <cstring>

#include "Protocol/ByteOrder.h"

// Nothing here can throw, so the operations need no trace.
namespace Varnholt::DeviceDriver::Generic::Utilities::EndianConversion {

static_assert(sizeof(float) == sizeof(std::uint32_t));

void ShortToByteArray(std::uint16_t value, std::uint8_t* bytes, bool bigEndian) {
    bigEndian ? Protocol::StoreBig16(bytes, value) : Protocol::StoreLittle16(bytes, value);
}

void ShortToByteArray(std::int16_t value, std::uint8_t* bytes, bool bigEndian) {
    ShortToByteArray(static_cast<std::uint16_t>(value), bytes, bigEndian);
}

void LongToByteArray(std::uint32_t value, std::uint8_t* bytes, bool bigEndian) {
    bigEndian ? Protocol::StoreBig32(bytes, value) : Protocol::StoreLittle32(bytes, value);
}

void LongToByteArray(std::int32_t value, std::uint8_t* bytes, bool bigEndian) {
    LongToByteArray(static_cast<std::uint32_t>(value), bytes, bigEndian);
}

void FloatToByteArray(const float& value, std::uint8_t* bytes, bool bigEndian) {
    std::uint32_t bits = 0;
    std::memcpy(&bits, &value, sizeof bits);
    LongToByteArray(bits, bytes, bigEndian);
}

void ByteArrayToShort(const std::uint8_t* bytes, std::uint16_t& value, bool bigEndian) {
    value = bigEndian ? Protocol::LoadBig16(bytes) : Protocol::LoadLittle16(bytes);
}

void ByteArrayToShort(const std::uint8_t* bytes, std::int16_t& value, bool bigEndian) {
    std::uint16_t bits = 0;
    ByteArrayToShort(bytes, bits, bigEndian);
    value = static_cast<std::int16_t>(bits);
}

void ByteArrayToLong(const std::uint8_t* bytes, std::uint32_t& value, bool bigEndian) {
    value = bigEndian ? Protocol::LoadBig32(bytes) : Protocol::LoadLittle32(bytes);
}

void ByteArrayToLong(const std::uint8_t* bytes, std::int32_t& value, bool bigEndian) {
    std::uint32_t bits = 0;
    ByteArrayToLong(bytes, bits, bigEndian);
    value = static_cast<std::int32_t>(bits);
}

void ByteArrayToFloat(const std::uint8_t* bytes, float& value, bool bigEndian) {
    std::uint32_t bits = 0;
    ByteArrayToLong(bytes, bits, bigEndian);
    std::memcpy(&value, &bits, sizeof bits);
}

}  // namespace Varnholt::DeviceDriver::Generic::Utilities::EndianConversion
