#include <gtest/gtest.h>

#include "Interface/Readout.h"

namespace Varnholt::Interface {
namespace {

TEST(Readout, ConvertsBigEndianValuesAndRepeatsTheEdges) {
    std::array<std::uint8_t, Protocol::ReadoutBytes> bytes{};
    const auto put = [&](std::size_t k, std::uint8_t high, std::uint8_t low) {
        bytes[2 * k] = high;
        bytes[2 * k + 1] = low;
    };
    put(0, 0x7F, 0xFF);  // never reaches the caller
    put(1, 0x00, 0x10);
    put(2, 0xF8, 0x00);
    put(3, 0xF8, 0x01);
    put(4, 0xFF, 0xFF);
    put(126, 0x01, 0x00);
    put(127, 0x55, 0x55);  // nor does this one

    const auto values = ReadoutFromBytes(bytes);
    EXPECT_EQ(values[0], 16);
    EXPECT_EQ(values[1], 16);
    EXPECT_EQ(values[2], 63488);
    EXPECT_EQ(values[3], -2047);
    EXPECT_EQ(values[4], -1);
    EXPECT_EQ(values[126], 256);
    EXPECT_EQ(values[127], 256);
}

}  // namespace
}  // namespace Varnholt::Interface
