// Scans whose data go to a receiver as they arrive, by either transport.
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "Platform/ErrorCodes.h"
#include "Protocol/UsbIoDriver.h"
#include "Support/DriverTest.h"
#include "Support/SimulatedHost.h"

namespace Varnholt::Tests {
namespace {

using namespace DeviceDriver::Ostra::LowLevel;

struct CollectingReceiver final : ScanReceiver {
    void Receive(std::span<const std::uint8_t> data) override {
        bytes.insert(bytes.end(), data.begin(), data.end());
    }

    Bytes bytes;
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
    enum Ending { Whole, Late, Stalled };
    using namespace Protocol::UsbIoDriver;
    const std::optional<std::uint32_t> codes[] = {
        std::nullopt, IsNative() ? Platform::Errors::IoIncomplete : Status::TimedOut,
        IsNative() ? Platform::Errors::GeneralFailure : Status::EndpointHalted};
    const std::vector<std::tuple<std::string, std::uint32_t, std::size_t, Ending>> cases{
        {"", total, total, Whole},
        {"", 0, total, Whole},
        {"", 313 * Record, 313 * Record, Whole},  // more than a transfer
        {"bulk-in 2:silent", total, 2 * first, Late},
        {"bulk-in 2:late-cancel", total, 3 * first, Late},
        {"bulk-in 2:late-cancel", 0, IsNative() ? 22 * Record : 3 * first, Late},
        {"bulk-in 1:stall", total, first, Stalled},
        {"bulk-in 1:short=512", total, first + 512, Whole},
        {"bulk-in 1:short=300", 0, (IsNative() ? 2 * Record : first) + 300, Whole},
    };
    for (const auto& [faults, asked, received, ending] : cases) {
        SCOPED_TRACE(faults + " of " + std::to_string(asked));
        SimulatedHost host(GetParam());
        host.Add("a", Streaming());
        host.Bus().SetFaults("a", Simulator::FaultPlan::Parse(faults));
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
            watch.ExpectBetween(ending == Late ? 4000 : 0, 4100);  // the time-out and its grace
            std::uint32_t size = Record;
            Bytes record(Record);
            instrument.GetScanData(record.data(), size);
            EXPECT_EQ(size, 0U) << "nothing is collected beside a receiver";
        }
        const Bytes all = Collected(total);
        EXPECT_EQ(receiver.bytes.size(), received);
        EXPECT_TRUE(std::equal(receiver.bytes.begin(), receiver.bytes.end(), all.begin()));
        EXPECT_EQ(code, codes[ending]);
    }
}

TEST_P(ReceivedScan, LeavesNothingOfTheScanBefore) {
    SimulatedHost host(GetParam());
    host.Add("a", Streaming());
    PellandoFunctionality instrument(nullptr, 0);
    instrument.StartScan(Record, 1, Record);
    CollectingReceiver receiver;
    instrument.SetScanReceiver(&receiver);
    instrument.StartScan(Record, 1, Record);
    std::uint32_t size = Record;
    instrument.GetScanData(Bytes(Record).data(), size);
    EXPECT_EQ(size, 0U);
}

}  // namespace
}  // namespace Varnholt::Tests
