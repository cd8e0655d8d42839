#include <gtest/gtest.h>

#include <memory>
#include <numeric>
#include <string>
#include <utility>
#include <vector>

#include "FaultInjector.h"
#include "Protocol/ByteOrder.h"
#include "SimulatedBus.h"
#include "Simulator/ManualScheduler.h"
#include "Support/TestTransfer.h"

namespace Varnholt::Simulator {
namespace {

using Platform::Usb::TransferStatus;
using Platform::Usb::UsbDevice;
using Protocol::BulkInEndpoint;
using Protocol::BulkOutEndpoint;
using Protocol::InterruptInEndpoint;
using Protocol::Request;
using Tests::TestTransfer;
using Bytes = std::vector<std::uint8_t>;
namespace Errors = Platform::Errors;

constexpr std::uint32_t ReadLength = 64;

/// A bus with one instrument whose memory is 0, 1, 2, ...
class FaultInjectorTest : public testing::Test {
  protected:
    FaultInjectorTest() {
        Bytes content(Protocol::EepromSize);
        for (std::size_t i = 0; i < content.size(); ++i) {
            content[i] = static_cast<std::uint8_t>(i);
        }
        InstrumentSettings settings;
        settings.eeprom = content;
        bus_.Add("one", settings);
    }
    ~FaultInjectorTest() override { EXPECT_EQ(0U, bus_.Instrument("one").PendingTransfers()); }

    std::shared_ptr<UsbDevice> Open(const std::string& plan) {
        bus_.SetFaults("one", FaultPlan::Parse(plan));
        Platform::ErrorCode error = Errors::Success;
        return bus_.Open("one", error);
    }
    /// Has the instrument send its memory from `address` on.
    static void AskForMemory(UsbDevice& device, std::uint32_t address) {
        TestTransfer request = TestTransfer::Memory(Request::ReadEeprom, address, ReadLength);
        EXPECT_EQ(Errors::Success, device.Submit(request));
        EXPECT_EQ(TransferStatus::Completed, request.status);
    }
    static Bytes Memory(std::uint8_t first, std::size_t length) {
        Bytes bytes(length);
        std::iota(bytes.begin(), bytes.end(), first);
        return bytes;
    }

    ManualScheduler scheduler_;
    SimulatedBus bus_{scheduler_};
};

TEST_F(FaultInjectorTest, FaultsOfABulkReadAndWhatComesNext) {
    Bytes flipped = Memory(10, ReadLength);
    flipped[2] ^= 0x08;
    struct Case {
        const char* fault;
        TransferStatus status;
        Bytes data;
        /// What the next read of the same endpoint gets; nothing: it stays pending.
        Bytes next;
    };
    for (const Case& test : {
             Case{"stall", TransferStatus::Stalled, {}, Memory(10, ReadLength)},
             Case{"io-error", TransferStatus::IoError, {}, Memory(10, ReadLength)},
             Case{"overflow", TransferStatus::Overflow, {}, Memory(10, ReadLength)},
             Case{"empty", TransferStatus::Completed, {}, Memory(10, ReadLength)},
             Case{"short", TransferStatus::Completed, Memory(10, 32), Memory(42, 32)},
             Case{"short=60", TransferStatus::Completed, Memory(10, 60), Memory(70, 4)},
             Case{"short=1000", TransferStatus::Completed, Memory(10, ReadLength), {}},
             Case{"long", TransferStatus::Overflow, Memory(10, ReadLength), {}},
             Case{"stale", TransferStatus::Completed, Memory(200, ReadLength), Memory(10, ReadLength)},
             Case{"flip=19", TransferStatus::Completed, flipped, {}},
         }) {
        const auto device = Open("bulk-in 1:" + std::string(test.fault));
        AskForMemory(*device, 200);
        TestTransfer before = TestTransfer::In(BulkInEndpoint, ReadLength);
        device->Submit(before);
        EXPECT_EQ(Memory(200, ReadLength), before.Data()) << test.fault;

        AskForMemory(*device, 10);
        TestTransfer hit = TestTransfer::In(BulkInEndpoint, ReadLength);
        EXPECT_EQ(Errors::Success, device->Submit(hit)) << test.fault;
        EXPECT_EQ(1, hit.completions) << test.fault;
        EXPECT_EQ(test.status, hit.status) << test.fault;
        EXPECT_EQ(test.data, hit.Data()) << test.fault;

        if (test.status == TransferStatus::Stalled) {
            TestTransfer halted = TestTransfer::In(BulkInEndpoint, ReadLength);
            device->Submit(halted);
            EXPECT_EQ(TransferStatus::Stalled, halted.status) << "halted until cleared";
            device->ClearHalt(BulkInEndpoint);
        }
        TestTransfer next = TestTransfer::In(BulkInEndpoint, ReadLength);
        device->Submit(next);
        EXPECT_EQ(test.next.empty() ? 0 : 1, next.completions) << test.fault;
        if (next.completions == 0) {
            device->Cancel(next);
        } else {
            EXPECT_EQ(test.next, next.Data()) << test.fault;
        }
    }
}

TEST_F(FaultInjectorTest, FaultsOfABulkWrite) {
    const Bytes sent{0x11, 0x22, 0x33, 0x44};
    const Bytes old = Memory(0, 4);
    struct Case {
        const char* fault;
        TransferStatus status;
        std::uint32_t moved;
        Bytes memory;
    };
    for (const Case& test : {
             Case{"stall", TransferStatus::Stalled, 0, old},
             Case{"io-error", TransferStatus::IoError, 0, old},
             Case{"overflow", TransferStatus::Overflow, 0, old},
             Case{"long", TransferStatus::Overflow, 0, old},
             Case{"empty", TransferStatus::Completed, 0, old},
             Case{"short=3", TransferStatus::Completed, 3, {0x11, 0x22, 0x33, 3}},
             Case{"stale", TransferStatus::Completed, 4, {0x99, 0, 0, 0}},
             Case{"flip=8", TransferStatus::Completed, 4, {0x11, 0x23, 0x33, 0x44}},
             Case{"gone-before", TransferStatus::DeviceGone, 0, old},
             Case{"gone-during", TransferStatus::DeviceGone, 2, {0x11, 0x22, 2, 3}},
             Case{"gone-after", TransferStatus::Completed, 4, sent},
         }) {
        SimulatedInstrument& instrument = bus_.Instrument("one");
        Bytes content = instrument.Eeprom();
        std::ranges::copy(old, content.begin());
        instrument.SetEeprom(content);
        const auto device = Open("bulk-out 1:" + std::string(test.fault));
        TestTransfer before = TestTransfer::Memory(Request::WriteEeprom, 100, 1);
        TestTransfer beforeData = TestTransfer::Out(BulkOutEndpoint, {0x99});
        TestTransfer request = TestTransfer::Memory(Request::WriteEeprom, 0, 4);
        TestTransfer data = TestTransfer::Out(BulkOutEndpoint, sent);
        device->Submit(before);
        device->Submit(beforeData);
        device->Submit(request);
        const bool refused = std::string(test.fault) == "gone-before";
        EXPECT_EQ(refused ? Errors::DeviceNotConnected : Errors::Success, device->Submit(data)) << test.fault;
        EXPECT_EQ(refused ? 0 : 1, data.completions) << test.fault;
        if (!refused) {
            EXPECT_EQ(test.status, data.status) << test.fault;
            EXPECT_EQ(test.moved, data.actualLength) << test.fault;
        }
        content = instrument.Eeprom();
        EXPECT_EQ(test.memory, Bytes(content.begin(), content.begin() + 4)) << test.fault;
        EXPECT_EQ(sent, data.buffer) << "the sender's own data stay as they are";
        instrument.PlugIn();
    }
}

TEST_F(FaultInjectorTest, ShortRequestsReachTheInstrumentShort) {
    const auto device = Open("0:short=4; 1:short=2");
    TestTransfer parameters = TestTransfer::Vendor(Request::SetMeasureParameters, Bytes(8, 1));
    device->Submit(parameters);
    EXPECT_EQ(TransferStatus::Stalled, parameters.status) << "four bytes are not enough for it";
    TestTransfer misc = TestTransfer::VendorQuestion(Request::GetMisc, 8);
    device->Submit(misc);
    EXPECT_EQ((Bytes{0x01, 0x2D}), misc.Data());
}

TEST_F(FaultInjectorTest, StandardRequestsAreNeitherCountedNorFail) {
    const auto device = Open("0:stall");
    TestTransfer descriptor = TestTransfer::Control({0x80, 6, 0x0100, 0, 18}, Bytes(18));
    TestTransfer reset = TestTransfer::Vendor(Request::Reset, {31});
    device->Submit(descriptor);
    device->Submit(reset);
    EXPECT_EQ(TransferStatus::Completed, descriptor.status);
    EXPECT_EQ(TransferStatus::Stalled, reset.status);
}

TEST_F(FaultInjectorTest, LateTransferReachesTheInstrumentLater) {
    auto device = Open("bulk-in 0+:late=20");
    AskForMemory(*device, 10);
    TestTransfer cancelled = TestTransfer::In(BulkInEndpoint, ReadLength);
    device->Submit(cancelled);
    scheduler_.Advance(19'999);
    device->Cancel(cancelled);
    EXPECT_EQ(TransferStatus::Cancelled, cancelled.status);
    TestTransfer hit = TestTransfer::In(BulkInEndpoint, ReadLength);
    device->Submit(hit);
    scheduler_.Advance(19'999);
    EXPECT_EQ(0, hit.completions);
    scheduler_.Advance(1);
    EXPECT_EQ(Memory(10, ReadLength), hit.Data()) << "nothing was lost to the cancelled one";
    EXPECT_EQ(1, cancelled.completions);

    TestTransfer last = TestTransfer::In(BulkInEndpoint, ReadLength);
    device->Submit(last);
    device.reset();
    EXPECT_EQ(1, last.completions) << "it does not outlive the device";
    EXPECT_EQ(TransferStatus::Cancelled, last.status);
    EXPECT_EQ(0U, scheduler_.Waiting());
}

/// What moved before the cancellation counts, and the rest comes next: each byte once.
TEST_F(FaultInjectorTest, TransfersThatNeverEndEndWithTheirCancellation) {
    const struct {
        const char* fault;
        Bytes data;
    } cases[] = {{"silent", {}}, {"late-cancel", Memory(10, 40)}};
    for (const auto& test : cases) {
        SCOPED_TRACE(test.fault);
        const auto device = Open("1+:" + std::string(test.fault));
        AskForMemory(*device, 10);
        TestTransfer hit = TestTransfer::In(BulkInEndpoint, 40);
        TestTransfer request = TestTransfer::Vendor(Request::Reset, {31});
        device->Submit(hit);
        scheduler_.Advance(3'600'000'000);
        EXPECT_EQ(0, hit.completions);
        device->Cancel(hit);
        device->Cancel(hit);
        EXPECT_EQ(1, hit.completions);
        EXPECT_EQ(TransferStatus::Cancelled, hit.status);
        EXPECT_EQ(test.data, hit.Data());
        TestTransfer rest = TestTransfer::In(BulkInEndpoint, 40);
        device->Submit(rest);
        device->Submit(request);
        EXPECT_EQ(0, rest.completions + request.completions);
        device->Cancel(rest);
        device->Cancel(request);
        EXPECT_EQ(TransferStatus::Cancelled, request.status);
        EXPECT_EQ(test.data.empty() ? Bytes() : Memory(50, 24), rest.Data());
    }
}

TEST_F(FaultInjectorTest, GoneDeviceEndsEverythingAndStaysGone) {
    const auto device = Open("2:gone-during");
    ASSERT_EQ(Errors::Success, device->Claim());
    TestTransfer interrupt = TestTransfer::In(InterruptInEndpoint, 1);
    TestTransfer hit = TestTransfer::In(BulkInEndpoint, ReadLength);
    device->Submit(interrupt);
    AskForMemory(*device, 10);
    EXPECT_EQ(Errors::Success, device->Submit(hit));
    for (const TestTransfer* each : {&hit, &interrupt}) {
        EXPECT_EQ(1, each->completions);
        EXPECT_EQ(TransferStatus::DeviceGone, each->status);
    }
    for (const bool isBack : {false, true}) {
        TestTransfer after = TestTransfer::In(BulkInEndpoint, ReadLength);
        EXPECT_EQ(Errors::DeviceNotConnected, device->Submit(after));
        EXPECT_EQ(Errors::DeviceNotConnected, device->Claim());
        EXPECT_EQ(isBack ? 1U : 0U, bus_.List().size());
        bus_.PlugIn("one");
    }
    Platform::ErrorCode error = Errors::Success;
    EXPECT_EQ(Errors::Success, bus_.Open("one", error)->Claim());
}

}  // namespace
}  // namespace Varnholt::Simulator
