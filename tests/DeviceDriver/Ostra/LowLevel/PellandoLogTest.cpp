#include <gtest/gtest.h>

#include <limits>

#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"
#include "FreshEeprom.h"
#include "Protocol/ByteOrder.h"
#include "Support/ExpectThrow.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Generic::Configuration;
using Tests::ExpectThrow;
using namespace Varnholt::Utilities::Exceptions;
using Bytes = std::vector<std::uint8_t>;
using Longs = std::vector<std::int32_t>;

constexpr std::size_t MainCopy = 0;
constexpr std::size_t SecondCopy = 2048;

class LogTest : public testing::Test {
  protected:
    LogTest() { table_.InitializeEmtpyEAT(); }

    PellandoLog Read() const { return PellandoLog(table_, image_.begin()); }
    void Store(std::size_t address, std::uint32_t value) { Protocol::StoreBig32(&image_[address], value); }

    PellandoEAT table_;
    Bytes image_ = Simulator::FreshEeprom();
    Bytes dumped_ = Bytes(1064);
};

TEST_F(LogTest, ChecksumAddsIntegersAndBitPatternsModulo32Bits) {
    const std::vector<std::tuple<const char*, std::uint16_t, Property, std::uint32_t>> cases{
        {"a float's bit pattern", 10001, Property(-2.0F), 0xC0000000},
        {"every element of a vector", 10010, Property(Longs(128, 3)), 384},
        {"a sum that wraps", 10011, Property(Longs{-1, 4}), 3},
        {"not the checksum itself", 10000, Property(77), 0},
    };
    std::uint32_t all = 0;
    PellandoLog together = Read();
    for (const auto& [name, id, value, sum] : cases) {
        together.SetItem(id, value);
        EXPECT_EQ(together.CalculateChecksum(), all += sum) << name;
    }
    EXPECT_FALSE(together.HasValidChecksum());
    together.UpdateChecksum();
    EXPECT_TRUE(together.HasValidChecksum());
    EXPECT_EQ(static_cast<std::uint32_t>(together.GetItem(10000).AsLong()), all);
}

TEST_F(LogTest, ValidCopyIsChosenMainCopyFirst) {
    // What 10002 is: 5 in the main copy and 6 in the second.
    const std::vector<std::tuple<const char*, std::uint32_t, std::uint32_t, std::int32_t>> cases{
        {"both right", 0x3F800005, 6, 5},
        {"main wrong", 0x3F800004, 6, 6},
        {"second wrong", 0x3F800005, 7, 5},
        {"both wrong", 0, 0, 0}};
    Store(MainCopy + 4, 0x3F800000);
    Store(MainCopy + 8, 5);
    Store(SecondCopy + 8, 6);
    for (const auto& [name, mainChecksum, secondChecksum, expected] : cases) {
        SCOPED_TRACE(name);
        Store(MainCopy, mainChecksum);
        Store(SecondCopy, secondChecksum);
        const PellandoLog log = Read();
        EXPECT_EQ(log.GetItem(10002).AsLong(), expected);
        EXPECT_EQ(log.GetItem(10001).AsFloat(), expected == 5 ? 1.0F : 0.0F);
        EXPECT_TRUE(log.HasValidChecksum());
        EXPECT_EQ(log.GetItems().GetPropertyKeys(), PellandoEAT::GetDefaultLogData().GetPropertyKeys());
        EXPECT_EQ(log.SizeOf(), 1064U);
        EXPECT_FALSE(log.IsDumpRecommended());
    }
}

TEST_F(LogTest, DumpIsRecommendedAfterTwentyChangesOrTheLastWatchedItem) {
    PellandoLog counting = Read();
    for (int change = 1; change <= 20; ++change) {
        EXPECT_FALSE(counting.IsDumpRecommended()) << change;
        counting.SetItem(10002, Property(change));
    }
    EXPECT_TRUE(counting.IsDumpRecommended());
    const std::vector<std::uint16_t> watched{10010, 10011, 10012, 10013, 10020, 10021};
    for (const std::uint16_t last : watched) {
        SCOPED_TRACE(last);
        PellandoLog log = Read();
        for (const bool isDumpedBetween : {false, false, true}) {  // a dump does not begin a new round
            for (const std::uint16_t id : watched) {
                if (id != last) {
                    log.SetItem(id, log.GetItem(id));
                    EXPECT_FALSE(log.IsDumpRecommended()) << id;
                }
            }
            if (isDumpedBetween) {
                log.Dump(dumped_.begin(), dumped_.end());
            }
            log.SetItem(last, log.GetItem(last));
            EXPECT_TRUE(log.IsDumpRecommended());
            log.Dump(dumped_.begin(), dumped_.end());
            EXPECT_FALSE(log.IsDumpRecommended());
        }
    }
}

TEST_F(LogTest, DumpWritesValuesWithAFreshChecksumFirst) {
    PellandoLog log = Read();
    log.SetItem(10002, Property(0x01020304));
    log.SetItem(10021, Property(-2));
    log.Dump(dumped_.begin(), dumped_.end());
    Store(0, 0x01020302);
    Store(8, 0x01020304);
    Store(1060, 0xFFFFFFFE);
    EXPECT_EQ(dumped_, Bytes(image_.begin(), image_.begin() + 1064));
    ExpectThrow<ResourceException>("Configuration data dump target too small",
                                   [&] { log.Dump(dumped_.begin(), dumped_.end() - 1); });
}

TEST_F(LogTest, IncrementAddsToWhatIsThere) {
    PellandoLog log = Read();
    log.SetItem(10003, Property(std::numeric_limits<std::int32_t>::max()));
    log.Increment(10003, std::int32_t{2});
    EXPECT_EQ(log.GetItem(10003).AsLong(), std::numeric_limits<std::int32_t>::min() + 1);
    log.SetItem(10001, Property(1.0F));
    log.Increment(10001, 0.5F);
    EXPECT_EQ(log.GetItem(10001).AsFloat(), 1.5F);
    ExpectThrow<ResourceException>("id 10009 doesn't exist", [&] { log.Increment(10009, std::int32_t{1}); });
    EXPECT_THROW(log.Increment(10001, std::int32_t{1}), RuntimeException);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
