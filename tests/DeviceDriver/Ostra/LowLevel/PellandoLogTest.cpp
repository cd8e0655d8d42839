#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <limits>

#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"
#include "FakeCommands.h"
#include "Protocol/ByteOrder.h"
#include "Support/ExpectThrow.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Generic::Configuration;
using Tests::ExpectThrow;
using Varnholt::Utilities::Exceptions::ResourceException;
using Varnholt::Utilities::Exceptions::RuntimeException;
using Longs = std::vector<std::int32_t>;

constexpr std::size_t MainCopy = 0;
constexpr std::size_t SecondCopy = 2048;

Property Long(std::int32_t value) {
    return Property(value);
}

class LogTest : public testing::Test {
  protected:
    LogTest() { table_.InitializeEmtpyEAT(); }

    PellandoLog Read() const { return PellandoLog(table_, image_.begin()); }
    void Store(std::size_t address, std::uint32_t value) { Protocol::StoreBig32(&image_[address], value); }

    PellandoEAT table_;
    Bytes image_ = FreshImage();
};

TEST_F(LogTest, ChecksumAddsIntegersAndBitPatternsModulo32Bits) {
    struct Case {
        const char* name;
        std::uint16_t id;
        Property value;
        std::uint32_t sum;
    };
    const Case cases[] = {
        {"an integer", 10002, Long(5), 5},
        {"a float's bit pattern", 10001, Property(1.0F), 0x3F800000},
        {"every element of a vector", 10010, Property(Longs(128, 3)), 384},
        {"a sum that wraps", 10011, Property(Longs{-1, 4}), 3},
        {"a float elsewhere", 10013, Property(-2.0F), 0xC0000000},
        {"not the checksum itself", 10000, Long(77), 0},
    };
    std::uint32_t all = 0;
    PellandoLog together = Read();
    for (const Case& row : cases) {
        PellandoLog log = Read();
        log.SetItem(row.id, row.value);
        EXPECT_EQ(log.CalculateChecksum(), row.sum) << row.name;
        together.SetItem(row.id, row.value);
        all += row.sum;
    }
    EXPECT_EQ(together.CalculateChecksum(), all);
    EXPECT_FALSE(together.HasValidChecksum());
    together.UpdateChecksum();
    EXPECT_TRUE(together.HasValidChecksum());
    EXPECT_EQ(static_cast<std::uint32_t>(together.GetItem(10000).AsLong()), all);
}

TEST_F(LogTest, ValidCopyIsChosenMainCopyFirst) {
    struct Case {
        const char* name;
        std::uint32_t mainChecksum, secondChecksum;
        std::int32_t expected;  ///< of 10002, which is 5 in the main copy and 6 in the second
    };
    for (const Case& row : {Case{"both right", 0x3F800005, 6, 5}, Case{"main wrong", 0x3F800004, 6, 6},
                            Case{"second wrong", 0x3F800005, 7, 5}, Case{"both wrong", 0, 0, 0}}) {
        SCOPED_TRACE(row.name);
        Store(MainCopy, row.mainChecksum);
        Store(MainCopy + 4, 0x3F800000);
        Store(MainCopy + 8, 5);
        Store(SecondCopy, row.secondChecksum);
        Store(SecondCopy + 8, 6);
        const PellandoLog log(table_, image_.begin());
        EXPECT_EQ(log.GetItem(10002).AsLong(), row.expected);
        EXPECT_EQ(log.GetItem(10001).AsFloat(), row.expected == 5 ? 1.0F : 0.0F);
        EXPECT_TRUE(log.HasValidChecksum());
        EXPECT_EQ(log.GetItems().GetPropertyKeys(), PellandoEAT::GetDefaultLogData().GetPropertyKeys());
        EXPECT_EQ(log.SizeOf(), 1064U);
        EXPECT_FALSE(log.IsDumpRecommended());
    }
    // The last row's log, of which no copy was valid.
    Store(MainCopy + 12, 7);
    EXPECT_EQ(Read().CalculateChecksum(), 0U) << "every item must have its default";
}

TEST_F(LogTest, DumpIsRecommendedAfterTwentyChanges) {
    PellandoLog log = Read();
    for (int change = 1; change <= 20; ++change) {
        EXPECT_FALSE(log.IsDumpRecommended()) << change;
        log.SetItem(10002, Long(change));
    }
    EXPECT_TRUE(log.IsDumpRecommended());
    Bytes bytes(1064);
    log.Dump(bytes.begin(), bytes.end());
    EXPECT_FALSE(log.IsDumpRecommended());
}

TEST_F(LogTest, DumpIsRecommendedWhenTheLastWatchedItemWasSet) {
    Bytes bytes(1064);
    const std::vector<std::uint16_t> watched{10010, 10011, 10012, 10013, 10020, 10021};
    for (const std::uint16_t last : watched) {
        SCOPED_TRACE(last);
        PellandoLog log = Read();
        const auto setAllButLast = [&] {
            for (const std::uint16_t id : watched) {
                if (id != last) {
                    log.SetItem(id, log.GetItem(id));
                    EXPECT_FALSE(log.IsDumpRecommended()) << id;
                }
            }
        };
        for (const bool isDumpedBetween : {false, false, true}) {  // a dump does not begin a new round
            setAllButLast();
            if (isDumpedBetween) {
                log.Dump(bytes.begin(), bytes.end());
            }
            log.SetItem(last, log.GetItem(last));
            EXPECT_TRUE(log.IsDumpRecommended());
            log.Dump(bytes.begin(), bytes.end());
        }
    }
}

TEST_F(LogTest, DumpWritesValuesWithAFreshChecksumFirst) {
    PellandoLog log = Read();
    log.SetItem(10002, Long(0x01020304));
    log.SetItem(10021, Long(-2));
    Bytes bytes(1066, 0xAA), expected(1064, 0);
    log.Dump(bytes.begin(), bytes.end());
    Protocol::StoreBig32(&expected[0], 0x01020302);
    Protocol::StoreBig32(&expected[8], 0x01020304);
    Protocol::StoreBig32(&expected[1060], 0xFFFFFFFE);
    expected.resize(1066, 0xAA);
    EXPECT_EQ(bytes, expected);
    ExpectThrow<ResourceException>("Configuration data dump target too small",
                                   [&] { log.Dump(bytes.begin(), bytes.begin() + 1063); });
}

TEST_F(LogTest, IncrementAddsToWhatIsThere) {
    PellandoLog log = Read();
    log.SetItem(10003, Long(7));
    log.Increment(10003, std::int32_t{2});
    EXPECT_EQ(log.GetItem(10003).AsLong(), 9);
    log.SetItem(10003, Long(std::numeric_limits<std::int32_t>::max()));
    log.Increment(10003, std::int32_t{1});
    EXPECT_EQ(log.GetItem(10003).AsLong(), std::numeric_limits<std::int32_t>::min());
    log.SetItem(10001, Property(1.0F));
    log.Increment(10001, 0.5F);
    EXPECT_EQ(log.GetItem(10001).AsFloat(), 1.5F);
    EXPECT_EQ(log.GetItem(10001).GetType(), TypeFloat);
    ExpectThrow<ResourceException>("id 10009 doesn't exist", [&] { log.Increment(10009, std::int32_t{1}); });
    EXPECT_THAT([&] { log.Increment(10001, std::int32_t{1}); }, testing::Throws<RuntimeException>());
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
