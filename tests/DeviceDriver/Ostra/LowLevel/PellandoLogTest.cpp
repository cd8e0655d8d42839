#include <gtest/gtest.h>

#include <limits>

#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"
#include "FreshEeprom.h"
#include "Protocol/ByteOrder.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Generic::Configuration;
using Bytes = std::vector<std::uint8_t>;

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

TEST_F(LogTest, ValidCopyIsChosenMainCopyFirst) {
    // What 10002 is: 5 in the main copy and 6 in the second.
    const std::vector<std::tuple<const char*, std::uint32_t, std::uint32_t, std::int32_t>> cases{
        {"both right", 5, 6, 5}, {"main wrong", 4, 6, 6}, {"second wrong", 5, 7, 5}, {"both wrong", 0, 0, 0}};
    Store(MainCopy + 4, 0x3F800000);
    Store(MainCopy + 8, 5);
    Store(MainCopy + 28, 0xC0800000);  // the second element of 10010, with which the sum begins anew
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

TEST_F(LogTest, DumpIsRecommendedAfterTheLastWatchedItem) {
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

TEST_F(LogTest, IncrementAddsToWhatIsThere) {
    PellandoLog log = Read();
    log.SetItem(10003, Property(std::numeric_limits<std::int32_t>::max()));
    log.Increment(10003, std::int32_t{2});
    EXPECT_EQ(log.GetItem(10003).AsLong(), std::numeric_limits<std::int32_t>::min() + 1);
    log.SetItem(10001, Property(1.0F));
    log.Increment(10001, 0.5F);
    EXPECT_EQ(log.GetItem(10001).AsFloat(), 1.5F);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
