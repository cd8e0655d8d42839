#include <gtest/gtest.h>

#include <algorithm>
#include <numeric>

#include "DeviceDriver/Ostra/LowLevel/Win64/ScanBuffer.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

TEST(ScanBuffer, GrowsWithItsContent) {
    ScanBuffer buffer;
    EXPECT_EQ(buffer.Size(), 0U);
    buffer.Reset(1000);
    EXPECT_EQ(std::count(buffer.Data(), buffer.Data() + 1000, 0), 1000);
    std::iota(buffer.Data(), buffer.Data() + 1000, std::uint8_t{0});

    buffer.Reserve(500);
    EXPECT_EQ(buffer.Capacity(), 1000U);
    buffer.Reserve(5'000'000);
    EXPECT_EQ(buffer.Size(), 1000U);
    buffer.Resize(5'000'000);
    buffer.Data()[4'999'999] = 1;
    for (std::size_t i = 0; i < 1000; ++i) {
        ASSERT_EQ(buffer.Data()[i], static_cast<std::uint8_t>(i));
    }
    buffer.Resize(5'000'001);
    EXPECT_EQ(buffer.Size(), 5'000'000U);
}

TEST(ScanBuffer, TakesNewMemoryOnlyWhereTheOldDoesNotDo) {
    ScanBuffer buffer;
    buffer.Reset(2000);
    const std::uint8_t* const before = buffer.Data();
    buffer.Reset(10);
    EXPECT_EQ(buffer.Size(), 10U);
    buffer.Reset(2000);
    EXPECT_EQ(buffer.Data(), before);
    buffer.Reset(2001);
    EXPECT_EQ(buffer.Capacity(), 2001U);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
