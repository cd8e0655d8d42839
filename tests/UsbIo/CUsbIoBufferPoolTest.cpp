#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <vector>

#include "UsbIo/CUsbIoBufferPool.h"

namespace Varnholt::UsbIo {
namespace {

TEST(CUsbIoBufferPool, HandsOutTheBufferPutBackLast) {
    CUsbIoBufferPool pool;
    EXPECT_EQ(pool.Get(), nullptr);
    ASSERT_TRUE(pool.Allocate(16, 3));
    EXPECT_FALSE(pool.Allocate(16, 3));
    EXPECT_EQ(pool.CurrentCount(), 3U);

    std::vector<CUsbIoBuffer*> taken;
    while (CUsbIoBuffer* const buffer = pool.Get()) {
        EXPECT_EQ(buffer->Next, nullptr);
        EXPECT_EQ(buffer->Size, 16U);
        std::memset(buffer->Buffer, static_cast<int>(taken.size()), buffer->Size);
        taken.push_back(buffer);
    }
    ASSERT_EQ(taken.size(), 3U);
    EXPECT_EQ(pool.CurrentCount(), 0U);
    // One block of memory; the buffer behind all others comes first.
    for (std::size_t i = 0; i < taken.size(); ++i) {
        const auto* const bytes = static_cast<const std::uint8_t*>(taken[i]->Buffer);
        EXPECT_EQ(std::count(bytes, bytes + 16, i), 16);
        EXPECT_EQ(bytes, static_cast<const std::uint8_t*>(taken.back()->Buffer) + 16 * (2 - i));
    }
    pool.Put(taken[0]);
    pool.Put(taken[2]);
    EXPECT_EQ(pool.CurrentCount(), 2U);
    EXPECT_EQ(pool.Get(), taken[2]);
    EXPECT_EQ(pool.Get(), taken[0]);

    pool.Free();
    EXPECT_EQ(pool.CurrentCount(), 0U);
    EXPECT_EQ(pool.Get(), nullptr);
    EXPECT_TRUE(pool.Allocate(1, 1));
}

TEST(CUsbIoBufferPool, RefusesWhatCannotBeHad) {
    CUsbIoBufferPool pool;
    EXPECT_FALSE(pool.Allocate(0xFFFFFFFF, 0xFFFFFFFF));
    EXPECT_EQ(pool.Get(), nullptr);
    EXPECT_EQ(pool.CurrentCount(), 0U);
    EXPECT_TRUE(pool.Allocate(4, 2));
}

}  // namespace
}  // namespace Varnholt::UsbIo
