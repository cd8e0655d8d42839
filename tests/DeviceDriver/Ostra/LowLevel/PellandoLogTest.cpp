#include <gtest/gtest.h>

#include <limits>

#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"
#include "FreshEeprom.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Generic::Configuration;
using Bytes = std::vector<std::uint8_t>;

class LogTest : public testing::Test {
  protected:
    LogTest() { table_.InitializeEmtpyEAT(); }

    PellandoLog Read() const { return PellandoLog(table_, image_.begin()); }

    PellandoEAT table_;
    Bytes image_ = Simulator::FreshEeprom();
    Bytes dumped_ = Bytes(1064);
};

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

TEST_F(LogTest, IncrementAddsToWhatIsThereAndADumpUpdatesTheChecksum) {
    PellandoLog log = Read();
    log.SetItem(10003, Property(std::numeric_limits<std::int32_t>::max()));
    log.Increment(10003, std::int32_t{2});
    EXPECT_EQ(log.GetItem(10003).AsLong(), std::numeric_limits<std::int32_t>::min() + 1);
    log.SetItem(10001, Property(1.0F));
    log.Increment(10001, 0.5F);
    EXPECT_EQ(log.GetItem(10001).AsFloat(), 1.5F);
    log.Dump(dumped_.begin(), dumped_.end());
    EXPECT_EQ(Bytes(dumped_.begin(), dumped_.begin() + 4), (Bytes{0xBF, 0xC0, 0x00, 0x01})) << "checksum";
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
