// Scans whose data go to a receiver as they arrive, and the counting of what commands move, by either
// transport.
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "Platform/ErrorCodes.h"
#include "Protocol/UsbIoDriver.h"
#include "Support/DriverTest.h"
#include "Support/SimulatedHost.h"

namespace Varnholt::Tests {
namespace {

using namespace DeviceDriver::Ostra::LowLevel;
using Bytes = std::vector<std::uint8_t>;

struct CollectingReceiver final : ScanReceiver {
    void Receive(std::span<const std::uint8_t> data) override {
        if (bytes.size() + data.size() > limit) {
            throw DataException("enough", "here");
        }
        bytes.insert(bytes.end(), data.begin(), data.end());
    }

    Bytes bytes;
    std::size_t limit = SIZE_MAX;
};

class ReceivedScan : public testing::TestWithParam<Transport> {
  protected:
    static constexpr std::uint32_t Record = 256;
    static constexpr std::uint32_t Records = 1000;

    static Simulator::InstrumentSettings Streaming() {
        return {.scanBytes = std::uint64_t{Record} * Records};
    }
    static bool IsNative() { return GetParam() == Transport::Native; }

    /// The noise of the readings goes on from one measurement to the next: each scan has an instrument anew.
    static Bytes Collected(std::uint32_t total) {
        SimulatedHost host(GetParam());
        host.Add("a", Streaming());
        PellandoFunctionality instrument(nullptr, 0);
        instrument.StartScan(Record, 1, total);
        Bytes all;
        for (Bytes record(Record);;) {
            std::uint32_t size = Record;
            instrument.GetScanData(record.data(), size);
            if (size == 0) {
                return all;
            }
            all.insert(all.end(), record.data(), record.data() + size);
        }
    }

    TestClock clock_{TestTime::Virtual};
};
OSTRA_ON_BOTH_TRANSPORTS(ReceivedScan);

TEST_P(ReceivedScan, BringsWhatWouldBeCollectedAndWhatCameBeforeAFailure) {
    constexpr std::uint32_t total = Record * Records;
    const std::uint32_t first = IsNative() ? 10 * Record : 65536;  // bytes of a counted scan's transfers
    using namespace Protocol::UsbIoDriver;
    for (const auto& [faults, asked, received, usbIoCode, nativeCode] :
         std::vector<std::tuple<const char*, std::uint32_t, std::size_t, std::optional<std::uint32_t>,
                                std::optional<std::uint32_t>>>{
             {"", total, total, {}, {}},
             {"", 0, total, {}, {}},
             {"", 313 * Record, 313 * Record, {}, {}},  // more than a transfer
             {"bulk-in 2:silent", total, 2 * first, Status::TimedOut, Platform::Errors::IoIncomplete},
             {"bulk-in 2:late-cancel", total, std::size_t{3} * first, Status::TimedOut,
              Platform::Errors::IoIncomplete},
             {"bulk-in 2:late-cancel", 0, IsNative() ? 22 * Record : std::size_t{3} * first, Status::TimedOut,
              Platform::Errors::IoIncomplete},
             {"bulk-in 1:stall", total, first, Status::EndpointHalted, Platform::Errors::GeneralFailure},
             {"bulk-in 1:short=512", total, first + 512, {}, {}},
             {"bulk-in 1:short=300", 0, (IsNative() ? 2 * Record : first) + 300, {}, {}},
         }) {
        SCOPED_TRACE(std::string(faults) + " of " + std::to_string(asked));
        SimulatedHost host(GetParam());
        host.Add("a", Streaming());
        if (*faults != '\0') {
            host.Bus().SetFaults("a", Simulator::FaultPlan::Parse(faults));
        }
        CollectingReceiver receiver;
        std::optional<std::uint32_t> code;
        {
            PellandoFunctionality instrument(nullptr, 0);
            instrument.SetScanReceiver(&receiver);
            const Stopwatch watch(clock_);
            try {
                instrument.StartScan(Record, 1, asked);
            } catch (const IOException& exception) {
                code = exception.Code();
            }
            // The time-out and its grace, on both.
            watch.ExpectBetween(code == Status::TimedOut || code == Platform::Errors::IoIncomplete ? 4000 : 0,
                                4100);
            std::uint32_t size = Record;
            Bytes record(Record);
            instrument.GetScanData(record.data(), size);
            EXPECT_EQ(size, 0U) << "nothing is collected beside a receiver";
        }
        const Bytes all = Collected(total);
        EXPECT_EQ(receiver.bytes.size(), received);
        EXPECT_TRUE(std::equal(receiver.bytes.begin(), receiver.bytes.end(), all.begin()));
        EXPECT_EQ(code, IsNative() ? nativeCode : usbIoCode);
    }
}

TEST_P(ReceivedScan, EndsWithWhatItsReceiverThrowsAndLeavesNothing) {
    SimulatedHost host(GetParam());
    host.Add("a", Streaming());
    PellandoFunctionality instrument(nullptr, 0);
    CollectingReceiver receiver;
    receiver.limit = 100000;
    Bytes record(Record);
    const auto collected = [&](ScanReceiver* to) {
        instrument.SetScanReceiver(to);
        instrument.StartScan(Record, 1, Record);
        std::uint32_t size = Record;
        instrument.GetScanData(record.data(), size);
        return size;
    };
    instrument.SetScanReceiver(&receiver);
    EXPECT_THROW(instrument.StartScan(Record, 1, 0), DataException);
    EXPECT_GT(receiver.bytes.size(), 0U);
    EXPECT_EQ(collected(nullptr), Record);
    instrument.StartScan(Record, 1, Record);
    receiver.limit = SIZE_MAX;
    EXPECT_EQ(collected(&receiver), 0U) << "nothing of the scan before is left";
}

TEST_P(ReceivedScan, DataStagesAreCounted) {
    struct Stages final : DataStageObserver {
        void DataStageEnded(std::uint32_t asked, std::uint32_t moved) override {
            seen.emplace_back(asked, moved);
        }
        std::vector<std::pair<std::uint32_t, std::uint32_t>> seen;
    } stages;
    SimulatedHost host(GetParam());
    host.Add("a");
    host.Bus().SetFaults(
        "a", Simulator::FaultPlan::Parse("control 1:short=3; control 2:empty; bulk-in 0:short=32"));
    PellandoFunctionality instrument(nullptr, 0);
    instrument.SetDataStageObserver(&stages);
    std::uint8_t m1 = 0, m3 = 0;
    std::uint16_t m2 = 0, m4 = 0, m5 = 0;
    instrument.GetMISC(m1, m2, m3, m4, m5);
    instrument.GetMISC(m1, m2, m3, m4, m5);
    instrument.SetMeasureMode(1);
    Bytes image(64);
    try {
        instrument.ReadEEPROM(0, image);
        EXPECT_FALSE(IsNative());
    } catch (const IOException& exception) {
        ASSERT_TRUE(IsNative() && exception.MissingData());
        EXPECT_EQ(exception.MissingData()->moved, 32U);
        EXPECT_EQ(exception.MissingData()->asked, 64U);
        stages.seen.emplace_back(64, 32);
    }
    using testing::Pair;
    EXPECT_THAT(stages.seen,
                testing::ElementsAre(Pair(8U, 3U), Pair(8U, 0U), Pair(1U, 1U), Pair(8U, 8U), Pair(64U, 32U)));
    WholeDataStages whole;
    EXPECT_NO_THROW(whole.DataStageEnded(7, 7));
    EXPECT_THROW(whole.DataStageEnded(7, 6), IOException);
}

}  // namespace
}  // namespace Varnholt::Tests
