#include "FaultInjector.h"
#include "Platform/Threads.h"
#include "SimulatedBus.h"
#include "Support/Bytes.h"
#include "Support/TestClock.h"
#include "Support/TestTransfer.h"

namespace Varnholt::Simulator {
namespace {

using namespace Platform::Usb;
using namespace Protocol;
using namespace Tests;
using Platform::SleepMilliseconds;

constexpr std::uint32_t ReadLength = 64;

/// A bus with one instrument whose memory is 0, 1, 2, ...
class FaultInjectorTest : public testing::Test {
  protected:
    FaultInjectorTest() { bus_.Add("one", {.eeprom = Counting(Protocol::EepromSize)}); }
    ~FaultInjectorTest() override { EXPECT_EQ(0U, bus_.Instrument("one").PendingTransfers()); }

    std::shared_ptr<UsbDevice> Open(const std::string& plan) {
        bus_.SetFaults("one", FaultPlan::Parse(plan));
        Platform::ErrorCode error = Errors::Success;
        return bus_.Open("one", error);
    }

    const TestClock clock_{TestTime::Virtual};
    SimulatedBus bus_{Platform::ClockScheduler()};
};

TEST_F(FaultInjectorTest, FaultsOfABulkReadAndWhatComesNext) {
    const Bytes all = Counting(ReadLength, 10);
    Bytes flipped = all;
    flipped[2] ^= 0x08;
    // Next comes what the endpoint's next read brings; empty: it stays pending.
    for (const auto& [fault, status, data, next] :
         std::vector<std::tuple<const char*, TransferStatus, Bytes, Bytes>>{
             {"stall", TransferStatus::Stalled, {}, all},
             {"io-error", TransferStatus::IoError, {}, all},
             {"overflow", TransferStatus::Overflow, {}, all},
             {"empty", TransferStatus::Completed, {}, all},
             {"short", TransferStatus::Completed, Counting(32, 10), Counting(32, 42)},
             {"short=60", TransferStatus::Completed, Counting(60, 10), Counting(4, 70)},
             {"short=1000", TransferStatus::Completed, all, {}},
             {"long", TransferStatus::Overflow, all, {}},
             {"stale", TransferStatus::Completed, Counting(ReadLength, 200), all},
             {"flip=19", TransferStatus::Completed, flipped, {}},
         }) {
        SCOPED_TRACE(fault);
        const auto device = Open("bulk-in 1:" + std::string(fault));
        const auto read = [&device](TestTransfer&& transfer) {
            EXPECT_EQ(Errors::Success, device->Submit(transfer));
            if (transfer.completions == 0) {
                device->Cancel(transfer);
            }
            EXPECT_EQ(1, transfer.completions);
            return std::pair(transfer.status, transfer.Data());
        };
        Do(*device, TestTransfer::Memory(Request::ReadEeprom, 200, ReadLength));
        EXPECT_EQ(Counting(ReadLength, 200), Do(*device, TestTransfer::In(BulkInEndpoint, ReadLength)));
        Do(*device, TestTransfer::Memory(Request::ReadEeprom, 10, ReadLength));
        EXPECT_EQ(std::pair(status, data), read(TestTransfer::In(BulkInEndpoint, ReadLength)));
        if (status == TransferStatus::Stalled) {
            EXPECT_EQ(status, read(TestTransfer::In(BulkInEndpoint, ReadLength)).first)
                << "halted until cleared";
            device->ClearHalt(BulkInEndpoint);
        }
        EXPECT_EQ(std::pair(next.empty() ? TransferStatus::Cancelled : TransferStatus::Completed, next),
                  read(TestTransfer::In(BulkInEndpoint, ReadLength)));
    }
}

TEST_F(FaultInjectorTest, FaultsOfABulkWrite) {
    const Bytes sent{0x11, 0x22, 0x33, 0x44};
    const Bytes old = Counting(4);
    for (const auto& [fault, status, moved, memory] :
         std::vector<std::tuple<const char*, TransferStatus, std::uint32_t, Bytes>>{
             {"stall", TransferStatus::Stalled, 0, old},
             {"long", TransferStatus::Overflow, 0, old},
             {"empty", TransferStatus::Completed, 0, old},
             {"short=3", TransferStatus::Completed, 3, {0x11, 0x22, 0x33, 3}},
             {"stale", TransferStatus::Completed, 4, {0x99, 0, 0, 0}},
             {"flip=8", TransferStatus::Completed, 4, {0x11, 0x23, 0x33, 0x44}},
             {"gone-before", TransferStatus::DeviceGone, 0, old},
             {"gone-during", TransferStatus::DeviceGone, 2, {0x11, 0x22, 2, 3}},
             {"gone-after", TransferStatus::Completed, 4, sent},
         }) {
        SCOPED_TRACE(fault);
        SimulatedInstrument& instrument = bus_.Instrument("one");
        instrument.SetEeprom(Counting(Protocol::EepromSize));
        const auto device = Open("bulk-out 1:" + std::string(fault));
        Do(*device, TestTransfer::Memory(Request::WriteEeprom, 100, 1));
        Do(*device, TestTransfer::Out(BulkOutEndpoint, {0x99}));
        Do(*device, TestTransfer::Memory(Request::WriteEeprom, 0, 4));
        TestTransfer data = TestTransfer::Out(BulkOutEndpoint, sent);
        if (std::string(fault) == "gone-before") {
            EXPECT_EQ(Errors::DeviceNotConnected, device->Submit(data));
            EXPECT_EQ(0, data.completions);
        } else {
            EXPECT_EQ(Errors::Success, device->Submit(data));
            EXPECT_EQ(1, data.completions);
            EXPECT_EQ(std::pair(status, moved), std::pair(data.status, data.actualLength));
        }
        const Bytes content = instrument.Eeprom();
        EXPECT_EQ(memory, Bytes(content.begin(), content.begin() + 4));
        EXPECT_EQ(sent, data.buffer) << "the sender's own data stay as they are";
        instrument.PlugIn();
    }
}

TEST_F(FaultInjectorTest, LateTransferReachesTheInstrumentLater) {
    if (!clock_.IsVirtual()) {
        GTEST_SKIP() << "hangs on milliseconds";
    }
    auto device = Open("bulk-in 0+:late=20");
    Do(*device, TestTransfer::Memory(Request::ReadEeprom, 10, ReadLength));
    TestTransfer cancelled = TestTransfer::In(BulkInEndpoint, ReadLength);
    device->Submit(cancelled);
    SleepMilliseconds(19);
    device->Cancel(cancelled);
    EXPECT_EQ(TransferStatus::Cancelled, cancelled.status);
    TestTransfer hit = TestTransfer::In(BulkInEndpoint, ReadLength);
    device->Submit(hit);
    SleepMilliseconds(19);
    EXPECT_EQ(0, hit.completions);
    SleepMilliseconds(2);
    EXPECT_EQ(Counting(ReadLength, 10), hit.Data()) << "nothing was lost to the cancelled one";
    EXPECT_EQ(1, cancelled.completions);
    TestTransfer last[]{TestTransfer::In(BulkInEndpoint, ReadLength),
                        TestTransfer::In(BulkInEndpoint, ReadLength)};
    device->Submit(last[0]);
    device->Submit(last[1]);
    device.reset();
    SleepMilliseconds(100);
    EXPECT_EQ(2, last[0].completions + last[1].completions) << "none outlives the device";
}

}  // namespace
}  // namespace Varnholt::Simulator
