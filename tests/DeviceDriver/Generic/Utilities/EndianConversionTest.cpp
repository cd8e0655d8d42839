#include <gtest/gtest.h>

#include <algorithm>
#include <array>

#include "DeviceDriver/Generic/Utilities/EndianConversion.h"

namespace Varnholt::DeviceDriver::Generic::Utilities::EndianConversion {
namespace {

/// In both orders: the bytes, and the value that comes out of them.
template <std::size_t Size, class Value, class Argument = Value>
void ExpectBytes(void (*write)(Argument, std::uint8_t*, bool),
                 void (*read)(const std::uint8_t*, Value&, bool), Value value,
                 std::array<std::uint8_t, Size> bytes) {
    for (const bool bigEndian : {true, false}) {
        std::array<std::uint8_t, Size> written{};
        write(value, written.data(), bigEndian);
        EXPECT_EQ(written, bytes) << value;
        Value back{};
        read(bytes.data(), back, bigEndian);
        EXPECT_EQ(back, value);
        std::reverse(bytes.begin(), bytes.end());
    }
}

TEST(EndianConversion, GoesBothWaysInBothOrders) {
    using Bytes2 = std::array<std::uint8_t, 2>;
    using Bytes4 = std::array<std::uint8_t, 4>;
    ExpectBytes<2, std::uint16_t>(ShortToByteArray, ByteArrayToShort, 0xF801, Bytes2{0xF8, 0x01});
    ExpectBytes<2, std::int16_t>(ShortToByteArray, ByteArrayToShort, -2, Bytes2{0xFF, 0xFE});
    ExpectBytes<4, std::uint32_t>(LongToByteArray, ByteArrayToLong, 0x81020304, Bytes4{0x81, 2, 3, 4});
    ExpectBytes<4, std::int32_t>(LongToByteArray, ByteArrayToLong, -2, Bytes4{0xFF, 0xFF, 0xFF, 0xFE});
    ExpectBytes<4, float, const float&>(FloatToByteArray, ByteArrayToFloat, -1.0F, Bytes4{0xBF, 0x80, 0, 0});
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Generic::Utilities::EndianConversion
