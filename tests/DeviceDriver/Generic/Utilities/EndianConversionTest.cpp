#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>

#include "DeviceDriver/Generic/Utilities/EndianConversion.h"

namespace Varnholt::DeviceDriver::Generic::Utilities::EndianConversion {
namespace {

using testing::ElementsAre;

TEST(EndianConversion, WritesBothOrders) {
    std::array<std::uint8_t, 2> two{};
    std::array<std::uint8_t, 4> four{};
    ShortToByteArray(std::uint16_t{0xF801}, two.data(), true);
    EXPECT_THAT(two, ElementsAre(0xF8, 0x01));
    ShortToByteArray(std::uint16_t{0xF801}, two.data(), false);
    EXPECT_THAT(two, ElementsAre(0x01, 0xF8));
    ShortToByteArray(std::int16_t{-2}, two.data(), true);
    EXPECT_THAT(two, ElementsAre(0xFF, 0xFE));
    LongToByteArray(std::uint32_t{0x81020304}, four.data(), true);
    EXPECT_THAT(four, ElementsAre(0x81, 2, 3, 4));
    LongToByteArray(std::int32_t{-2}, four.data(), false);
    EXPECT_THAT(four, ElementsAre(0xFE, 0xFF, 0xFF, 0xFF));
    FloatToByteArray(-1.0F, four.data(), true);
    EXPECT_THAT(four, ElementsAre(0xBF, 0x80, 0, 0));
    FloatToByteArray(-1.0F, four.data(), false);
    EXPECT_THAT(four, ElementsAre(0, 0, 0x80, 0xBF));
}

TEST(EndianConversion, ReadsBothOrders) {
    const std::array<std::uint8_t, 4> bytes{0xF8, 0x01, 0x02, 0x03};
    struct Row {
        bool bigEndian;
        std::uint16_t unsignedShort;
        std::uint32_t unsignedLong;
    };
    for (const Row& row : {Row{true, 0xF801, 0xF8010203}, Row{false, 0x01F8, 0x030201F8}}) {
        std::uint16_t unsignedShort = 0;
        std::int16_t signedShort = 0;
        std::uint32_t unsignedLong = 0;
        std::int32_t signedLong = 0;
        ByteArrayToShort(bytes.data(), unsignedShort, row.bigEndian);
        ByteArrayToShort(bytes.data(), signedShort, row.bigEndian);
        ByteArrayToLong(bytes.data(), unsignedLong, row.bigEndian);
        ByteArrayToLong(bytes.data(), signedLong, row.bigEndian);
        EXPECT_EQ(unsignedShort, row.unsignedShort);
        EXPECT_EQ(signedShort, static_cast<std::int16_t>(row.unsignedShort));
        EXPECT_EQ(unsignedLong, row.unsignedLong);
        EXPECT_EQ(signedLong, static_cast<std::int32_t>(row.unsignedLong));
    }
    float value = 0;
    ByteArrayToFloat(std::array<std::uint8_t, 4>{0x40, 0x20, 0, 0}.data(), value, true);
    EXPECT_EQ(value, 2.5F);
    ByteArrayToFloat(std::array<std::uint8_t, 4>{0, 0, 0x20, 0x40}.data(), value, false);
    EXPECT_EQ(value, 2.5F);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Generic::Utilities::EndianConversion
