#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <new>
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

TEST_F(FaultInjectorTest, GarbageIsNoData) {
    const auto device = Open("bulk-in 0:garbage");
    AskForMemory(*device, 10);
    TestTransfer hit = TestTransfer::In(BulkInEndpoint, ReadLength);
    device->Submit(hit);
    EXPECT_EQ(ReadLength, hit.actualLength);
    EXPECT_NE(Memory(10, ReadLength), hit.Data());
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

TEST_F(FaultInjectorTest, SilentTransferEndsWithItsCancellationOnly) {
    const auto device = Open("1+:silent");
    AskForMemory(*device, 10);
    TestTransfer hit = TestTransfer::In(BulkInEndpoint, ReadLength);
    TestTransfer request = TestTransfer::Vendor(Request::Reset, {31});
    device->Submit(hit);
    device->Submit(request);
    scheduler_.Advance(3'600'000'000);
    for (TestTransfer* transfer : {&hit, &request}) {
        EXPECT_EQ(0, transfer->completions);
        device->Cancel(*transfer);
        device->Cancel(*transfer);
        EXPECT_EQ(1, transfer->completions);
        EXPECT_EQ(TransferStatus::Cancelled, transfer->status);
        EXPECT_EQ(0U, transfer->actualLength);
    }
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

/// Wherever the memory runs out, a transfer is refused or ends, once, and nothing is waited for at the end.
TEST_F(FaultInjectorTest, ATransferThatThereIsNoMemoryForEnds) {
    class WithoutMemory final : public ManualScheduler, public UsbDevice {
      public:
        EventId CallAt(std::uint64_t time, std::function<void()> event) override {
            return hasAlarms ? ManualScheduler::CallAt(time, std::move(event)) : throw std::bad_alloc();
        }
        std::vector<Platform::Usb::EndpointInfo> Endpoints(Platform::ErrorCode&) override { return {}; }
        Platform::ErrorCode Claim() override { return Errors::Success; }
        void Release() override {}
        Platform::ErrorCode Submit(Platform::Usb::Transfer&) override { throw std::bad_alloc(); }
        void Cancel(Platform::Usb::Transfer&) override { ADD_FAILURE() << "nothing was accepted"; }
        Platform::ErrorCode ClearHalt(std::uint8_t) override { return Errors::Success; }

        bool hasAlarms = true;
    };
    struct Case {
        const char* name;
        const char* plan;
        bool hasAlarms;
        int completions;
    };
    for (const Case& test : {Case{"at once", "", true, 0}, Case{"no alarm", "0:late=5", false, 0},
                             Case{"later", "0:late=5", true, 1}, Case{"polled", "0:short=1", true, 1}}) {
        SCOPED_TRACE(test.name);
        const auto behind = std::make_shared<WithoutMemory>();
        behind->hasAlarms = test.hasAlarms;
        auto device =
            InjectFaults(behind, std::make_shared<FaultScript>(FaultPlan::Parse(test.plan)), *behind);
        TestTransfer transfer = TestTransfer::In(InterruptInEndpoint, 4);
        const auto code = device->Submit(transfer);
        EXPECT_EQ(test.completions == 0 ? Errors::NotEnoughMemory : Errors::Success, code);
        behind->Advance(10'000);
        EXPECT_EQ(test.completions, transfer.completions);
        EXPECT_TRUE(test.completions == 0 || transfer.status == TransferStatus::IoError);
        device.reset();
        EXPECT_EQ(test.completions, transfer.completions);
        EXPECT_EQ(0U, behind->Waiting());
    }
}

TEST_F(FaultInjectorTest, LateCancelBringsDataWithTheCancellation) {
    const auto device = Open("bulk-in 0+:late-cancel");
    AskForMemory(*device, 10);
    TestTransfer hit = TestTransfer::In(BulkInEndpoint, 40);
    device->Submit(hit);
    EXPECT_EQ(0, hit.completions);
    device->Cancel(hit);
    EXPECT_EQ(1, hit.completions);
    EXPECT_EQ(TransferStatus::Cancelled, hit.status);
    EXPECT_EQ(Memory(10, 40), hit.Data());

    TestTransfer rest = TestTransfer::In(BulkInEndpoint, ReadLength);
    device->Submit(rest);
    device->Cancel(rest);
    EXPECT_EQ(Memory(50, 24), rest.Data()) << "each byte comes once";
}

TEST_F(FaultInjectorTest, GoneDeviceEndsEverythingAndStaysGone) {
    for (const std::string kind : {"gone-before", "gone-during", "gone-after"}) {
        const auto device = Open("2:" + kind);
        ASSERT_EQ(Errors::Success, device->Claim());
        TestTransfer interrupt = TestTransfer::In(InterruptInEndpoint, 1);
        device->Submit(interrupt);
        AskForMemory(*device, 10);
        TestTransfer hit = TestTransfer::In(BulkInEndpoint, ReadLength);
        const auto code = device->Submit(hit);
        EXPECT_EQ(kind == "gone-before" ? Errors::DeviceNotConnected : Errors::Success, code) << kind;
        EXPECT_EQ(kind == "gone-before" ? 0 : 1, hit.completions) << kind;
        if (kind != "gone-before") {
            EXPECT_EQ(kind == "gone-after" ? TransferStatus::Completed : TransferStatus::DeviceGone,
                      hit.status);
        }
        EXPECT_EQ(1, interrupt.completions) << kind;
        EXPECT_EQ(TransferStatus::DeviceGone, interrupt.status) << kind;

        TestTransfer after = TestTransfer::In(BulkInEndpoint, ReadLength);
        EXPECT_EQ(Errors::DeviceNotConnected, device->Submit(after)) << kind;
        EXPECT_EQ(Errors::DeviceNotConnected, device->Claim()) << kind;
        EXPECT_TRUE(bus_.List().empty()) << kind;

        bus_.PlugIn("one");
        EXPECT_EQ(Errors::DeviceNotConnected, device->Claim()) << kind;
        Platform::ErrorCode error = Errors::Success;
        const auto again = bus_.Open("one", error);
        EXPECT_EQ(Errors::Success, again->Claim()) << kind;
        AskForMemory(*again, 10);
    }
}

}  // namespace
}  // namespace Varnholt::Simulator
