#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "FreshEeprom.h"

namespace Varnholt::Simulator {
namespace {

using Bytes = std::vector<std::uint8_t>;

Bytes Part(const Bytes& image, std::size_t start, std::size_t length) {
    const auto first = image.begin() + static_cast<std::ptrdiff_t>(start);
    return {first, first + static_cast<std::ptrdiff_t>(length)};
}

TEST(FreshEepromTest, HoldsTheTableAndNothingElseButEmptyValues) {
    const Bytes image = FreshEeprom();
    ASSERT_EQ(8192U, image.size());
    EXPECT_EQ((Bytes{0x00, 0x01, 0x01, 0x4E, 0x27, 0x10, 0x00, 0x00, 0x00, 0x00}), Part(image, 4096, 10));
    EXPECT_EQ((Bytes{0x00, 0x01, 0x00, 0x00, 0x04, 0x28}), Part(image, 4096 + 4 + 6 * 12, 6)) << "end of log";
    EXPECT_EQ((Bytes{0x2A, 0xF8, 0x00, 0x00, 0x08, 0x00}), Part(image, 4096 + 4 + 6 * 13, 6)) << "log copy";
    EXPECT_EQ((Bytes{0x0B, 0xC5, 0x00, 0x00, 0x12, 0x90}), Part(image, 4096 + 4 + 6 * 53, 6)) << "3013";
    EXPECT_EQ((Bytes{0x00, 0x02, 0x00, 0x00, 0x12, 0x94, 0xFF}), Part(image, 4096 + 4 + 6 * 54, 7))
        << "the end";
    EXPECT_EQ((Bytes{0xBF, 0x80, 0x00, 0x00}), Part(image, 4608, 4)) << "-1.0";
    EXPECT_EQ((Bytes{0xFF, 0xFF, 0xFF, 0xFF}), Part(image, 4624, 4)) << "-1";

    for (const std::size_t log : {0U, 2048U}) {
        EXPECT_EQ(Bytes(1064, 0), Part(image, log, 1064));
    }
    EXPECT_EQ(Bytes(2048 - 1064, 0xFF), Part(image, 1064, 2048 - 1064));
    EXPECT_EQ(Bytes(8192 - 4756, 0xFF), Part(image, 4756, 8192 - 4756));
}

}  // namespace
}  // namespace Varnholt::Simulator
