#include <gtest/gtest.h>

#include <algorithm>
#include <numeric>

#include "Protocol/ByteOrder.h"
#include "SimulatedInstrument.h"
#include "Simulator/ManualScheduler.h"
#include "Support/TestTransfer.h"

namespace Varnholt::Simulator {
namespace {

using Platform::Usb::TransferStatus;
using Protocol::BulkInEndpoint;
using Protocol::BulkOutEndpoint;
using Protocol::InterruptInEndpoint;
using Protocol::Request;
using Tests::TestTransfer;
using Bytes = std::vector<std::uint8_t>;
namespace Errors = Platform::Errors;

class SimulatedInstrumentTest : public testing::Test {
  protected:
    /// Submits a transfer that must be done at once and answers its data.
    Bytes Do(TestTransfer& transfer) {
        EXPECT_EQ(Errors::Success, instrument_.Submit(transfer));
        EXPECT_EQ(1, transfer.completions);
        EXPECT_EQ(TransferStatus::Completed, transfer.status);
        return transfer.Data();
    }
    Bytes Do(TestTransfer&& transfer) { return Do(transfer); }
    TransferStatus StatusOf(TestTransfer&& transfer) {
        EXPECT_EQ(Errors::Success, instrument_.Submit(transfer));
        EXPECT_EQ(1, transfer.completions);
        return transfer.status;
    }
    Bytes ReadEeprom(std::uint32_t address, std::uint16_t length) {
        Do(TestTransfer::Memory(Request::ReadEeprom, address, length));
        return Do(TestTransfer::In(BulkInEndpoint, length));
    }

    ManualScheduler scheduler_;
    SimulatedInstrument instrument_{scheduler_};
};

TEST_F(SimulatedInstrumentTest, WrittenMemoryIsReadBack) {
    Bytes piece(256);
    std::iota(piece.begin(), piece.end(), std::uint8_t{7});
    Do(TestTransfer::Memory(Request::WriteEeprom, 7936, 256));
    Do(TestTransfer::Out(BulkOutEndpoint, {piece.begin(), piece.begin() + 100}));
    Do(TestTransfer::Out(BulkOutEndpoint, {piece.begin() + 100, piece.end()}));
    Do(TestTransfer::Out(BulkOutEndpoint, {0}));
    Do(TestTransfer::Out(BulkOutEndpoint, {0}));
    EXPECT_EQ(piece, ReadEeprom(7936, 256));

    TestTransfer nobodyExpectsThis = TestTransfer::Out(BulkOutEndpoint, {0});
    instrument_.Submit(nobodyExpectsThis);
    EXPECT_EQ(0, nobodyExpectsThis.completions) << "a third closing byte must wait";
    instrument_.Cancel(nobodyExpectsThis);
    EXPECT_EQ(TransferStatus::Cancelled, nobodyExpectsThis.status);
    EXPECT_EQ(piece, ReadEeprom(7936, 256)) << "closing bytes are no data";
}

TEST_F(SimulatedInstrumentTest, RefusesWhatItCannotDo) {
    struct Case {
        const char* name;
        Platform::Usb::SetupPacket setup;
        Bytes data;
    };
    const auto out = [](Request request, std::uint16_t value = 0) {
        return Platform::Usb::SetupPacket{0x40, static_cast<std::uint8_t>(request), value, 0, 0};
    };
    for (const Case& test : {
             Case{"unknown request", {0x40, 0x99, 0, 0, 0}, {}},
             Case{"unknown question", {0xC0, 0x99, 0, 0, 8}, Bytes(8)},
             Case{"question with a request's code", {0xC0, 0xC1, 0, 0, 8}, Bytes(8)},
             Case{"class request", {0x21, 0xC0, 0, 0, 0}, {}},
             Case{"vendor request to an interface", {0x41, 0xC0, 0, 0, 0}, {}},
             Case{"parameters without flags", out(Request::SetMeasureParameters), Bytes(6)},
             Case{"write across the end", out(Request::WriteEeprom), TestTransfer::AddressAndLength(8191, 2)},
             Case{"write far outside", out(Request::WriteEeprom),
                  TestTransfer::AddressAndLength(0xFFFFFFFF, 2)},
             Case{"read across the end", out(Request::ReadEeprom), TestTransfer::AddressAndLength(8128, 128)},
             Case{"read without a length", out(Request::ReadEeprom), Bytes(4)},
             Case{"RAM firmware across the end", out(Request::DownloadRamFirmware, 0xFFFF), Bytes(2)},
             Case{"configuration 2", {0x00, 9, 2, 0, 0}, {}},
             Case{"device qualifier", {0x80, 6, 0x0600, 0, 10}, Bytes(10)},
         }) {
        TestTransfer transfer = TestTransfer::Control(test.setup, test.data);
        transfer.setup.length = static_cast<std::uint16_t>(test.data.size());
        EXPECT_EQ(Errors::Success, instrument_.Submit(transfer)) << test.name;
        EXPECT_EQ(TransferStatus::Stalled, transfer.status) << test.name;
        EXPECT_EQ(0U, transfer.actualLength) << test.name;
        EXPECT_EQ(1, transfer.completions) << test.name;
    }
    // A refused setup does not halt endpoint 0.
    EXPECT_EQ(8U, Do(TestTransfer::VendorQuestion(Request::GetChipId, 8)).size());
}

TEST_F(SimulatedInstrumentTest, ReadoutComesOnceAndThenNothing) {
    TestTransfer early = TestTransfer::In(BulkInEndpoint, 256);
    instrument_.Submit(early);
    EXPECT_EQ(0, early.completions) << "nothing was asked for yet";
    Do(TestTransfer::Vendor(Request::Measure));
    EXPECT_EQ(1, early.completions);
    EXPECT_EQ(256U, early.actualLength);

    // It was taken whole, so an empty transfer tells the end; then the endpoint is silent.
    EXPECT_EQ(0U, Do(TestTransfer::In(BulkInEndpoint, 256)).size());
    TestTransfer late = TestTransfer::In(BulkInEndpoint, 256);
    instrument_.Submit(late);
    EXPECT_EQ(0, late.completions);
    EXPECT_EQ(1U, instrument_.PendingTransfers());
    instrument_.Cancel(late);
    instrument_.Cancel(late);
    EXPECT_EQ(1, late.completions);
    EXPECT_EQ(TransferStatus::Cancelled, late.status);
}

TEST_F(SimulatedInstrumentTest, NewRequestDropsWhatWasLeft) {
    Do(TestTransfer::Vendor(Request::Measure));
    Do(TestTransfer::In(BulkInEndpoint, 100));
    const Bytes start = instrument_.Eeprom();
    EXPECT_EQ(Bytes(start.begin(), start.begin() + 64), ReadEeprom(0, 64));
    TestTransfer rest = TestTransfer::In(BulkInEndpoint, 64);
    instrument_.Submit(rest);
    EXPECT_EQ(0, rest.completions) << "memory of a length that the host named has no end mark";
    instrument_.Cancel(rest);

    Do(TestTransfer::Vendor(Request::Measure));
    Do(TestTransfer::Memory(Request::WriteEeprom, 0, 2));
    Do(TestTransfer::Vendor(Request::Reset, {31}));
    for (const std::uint8_t endpoint : {BulkInEndpoint, BulkOutEndpoint}) {
        TestTransfer silent = TestTransfer::In(endpoint, 2);
        instrument_.Submit(silent);
        EXPECT_EQ(0, silent.completions) << "a reset ends what was under way";
        instrument_.Cancel(silent);
    }
}

/// The ways in which hosts read a scan.
TEST_F(SimulatedInstrumentTest, ScanEndsWithTheTransferThatIsNotFull) {
    struct Case {
        const char* name;
        std::uint64_t scanBytes;
        std::vector<std::uint32_t> reads;
        std::vector<std::uint32_t> expected;
    };
    for (const Case& test : {
             Case{"two records first, then ten at a time",
                  256 * 25,
                  {512, 2560, 2560, 2560},
                  {512, 2560, 2560, 768}},
             Case{"ends on a whole chunk", 256 * 12, {512, 2560, 2560}, {512, 2560, 0}},
             Case{"large reads", 150000, {65536, 65536, 65536}, {65536, 65536, 18928}},
             Case{"odd records", 120, {50, 50, 20}, {50, 50, 20}},
             Case{"an empty read takes nothing", 100000, {65536, 0, 34464, 0}, {65536, 0, 34464, 0}},
             Case{"nothing measured", 0, {256}, {0}},
         }) {
        InstrumentSettings settings;
        settings.scanBytes = test.scanBytes;
        SimulatedInstrument scanning(scheduler_, settings);
        TestTransfer measure = TestTransfer::Vendor(Request::Measure);
        scanning.Submit(measure);
        Bytes all;
        std::vector<std::uint32_t> sizes;
        for (const std::uint32_t read : test.reads) {
            TestTransfer transfer = TestTransfer::In(BulkInEndpoint, read);
            scanning.Submit(transfer);
            EXPECT_EQ(1, transfer.completions) << test.name;
            sizes.push_back(transfer.actualLength);
            all.insert(all.end(), transfer.buffer.data(), transfer.buffer.data() + transfer.actualLength);
        }
        EXPECT_EQ(test.expected, sizes) << test.name;
        EXPECT_EQ(
            scanning.WithCommands([&](Commands& state) { return state.Answers().Expected(0, all.size()); }),
            all)
            << test.name;
    }
}

TEST_F(SimulatedInstrumentTest, PacedDataComeInTime) {
    InstrumentSettings settings;
    settings.scanBytes = 4096;
    settings.bytesPerSecond = 1'000'000;
    SimulatedInstrument paced(scheduler_, settings);
    TestTransfer measure = TestTransfer::Vendor(Request::Measure);
    TestTransfer first = TestTransfer::In(BulkInEndpoint, 1024);
    TestTransfer second = TestTransfer::In(BulkInEndpoint, 2048);
    paced.Submit(measure);
    paced.Submit(first);
    paced.Submit(second);
    scheduler_.Advance(1023);
    EXPECT_EQ(0, first.completions);
    scheduler_.Advance(1);
    EXPECT_EQ(1, first.completions);

    // Cancelled half way: the packets that had come are in, and the rest follows with the next transfer.
    scheduler_.Advance(1100);
    paced.Cancel(second);
    EXPECT_EQ(TransferStatus::Cancelled, second.status);
    EXPECT_EQ(1024U, second.actualLength);
    TestTransfer third = TestTransfer::In(BulkInEndpoint, 4096);
    paced.Submit(third);
    scheduler_.Advance(2048);
    EXPECT_EQ(1, third.completions);
    EXPECT_EQ(2048U, third.actualLength);
    EXPECT_EQ(paced.WithCommands([](Commands& state) { return state.Answers().Expected(2048, 2048); }),
              third.Data());
    EXPECT_EQ(0U, scheduler_.Waiting());
}

TEST_F(SimulatedInstrumentTest, MeasurementCanTakeItsTime) {
    InstrumentSettings settings;
    settings.takesIntegrationTime = true;
    SimulatedInstrument slow(scheduler_, settings);
    TestTransfer measure = TestTransfer::Vendor(Request::Measure);
    TestTransfer readout = TestTransfer::In(BulkInEndpoint, 256);
    slow.Submit(measure);
    slow.Submit(readout);
    scheduler_.Advance(294 * 68 - 1);
    EXPECT_EQ(0, readout.completions);
    scheduler_.Advance(1);
    EXPECT_EQ(1, readout.completions);
}

TEST_F(SimulatedInstrumentTest, ButtonReportWaitsForTheHost) {
    TestTransfer first = TestTransfer::In(InterruptInEndpoint, 8);
    instrument_.Submit(first);
    EXPECT_EQ(0, first.completions);
    instrument_.PressButton();
    EXPECT_EQ(1, first.completions);
    EXPECT_EQ(1U, first.actualLength);

    instrument_.PressButton();
    instrument_.PressButton();
    EXPECT_EQ(1U, Do(TestTransfer::In(InterruptInEndpoint, 1)).size());
    TestTransfer third = TestTransfer::In(InterruptInEndpoint, 1);
    instrument_.Submit(third);
    EXPECT_EQ(0, third.completions) << "two presses that nobody fetched make one report";
    instrument_.Cancel(third);
}

TEST_F(SimulatedInstrumentTest, HaltedEndpointStallsUntilCleared) {
    const auto isHalted = [this] {
        return Do(TestTransfer::Control({0x82, 0, 0, BulkInEndpoint, 2}, Bytes(2))) == Bytes{1, 0};
    };
    for (const bool byRequest : {true, false}) {
        TestTransfer pending = TestTransfer::In(BulkInEndpoint, 64);
        instrument_.Submit(pending);
        instrument_.HaltEndpoint(BulkInEndpoint);
        EXPECT_EQ(TransferStatus::Stalled, pending.status);
        EXPECT_EQ(TransferStatus::Stalled, StatusOf(TestTransfer::In(BulkInEndpoint, 64)));
        EXPECT_TRUE(isHalted());
        if (byRequest) {
            Do(TestTransfer::Control({0x02, 1, 0, BulkInEndpoint, 0}, {}));
        } else {
            EXPECT_EQ(Errors::Success, instrument_.ClearHalt(BulkInEndpoint));
        }
        EXPECT_FALSE(isHalted());
        EXPECT_EQ(64U, ReadEeprom(0, 64).size());
    }
    // More data than announced do not run over the end of the write.
    Do(TestTransfer::Memory(Request::WriteEeprom, 0, 2));
    EXPECT_EQ(TransferStatus::Stalled, StatusOf(TestTransfer::Out(BulkOutEndpoint, {1, 2, 3})));
}

TEST_F(SimulatedInstrumentTest, DescriptorsAreWhatAnOperatingSystemExpects) {
    const auto get = [this](std::uint16_t value, std::uint16_t length) {
        return Do(TestTransfer::Control({0x80, 6, value, 0, length}, Bytes(length)));
    };
    const Bytes device = get(0x0100, 64);
    ASSERT_EQ(18U, device.size());
    EXPECT_EQ(18, device[0]);
    const Bytes configuration = get(0x0200, 255);
    ASSERT_EQ(9U + 9U + 3 * 7U, configuration.size());
    EXPECT_EQ(configuration.size(), Protocol::LoadLittle16(&configuration[2]));
    EXPECT_EQ(
        (Bytes{7, 5, 0x03, 2, 0x00, 0x02, 0, 7, 5, 0x82, 2, 0x00, 0x02, 0, 7, 5, 0x84, 3, 0x08, 0x00, 4}),
        Bytes(configuration.begin() + 18, configuration.end()));
    EXPECT_EQ((Bytes{16, 3, 'S', 0, 'I', 0, 'M', 0, '0', 0, '0', 0, '0', 0, '1', 0}), get(0x0303, 255));
}

TEST_F(SimulatedInstrumentTest, UnplugEndsEverythingAndLosesWhatIsVolatile) {
    ASSERT_EQ(Errors::Success, instrument_.Claim());
    Do(TestTransfer::Vendor(Request::SetMeasureParameters, Bytes(8, 9)));
    Do(TestTransfer::Memory(Request::WriteEeprom, 100, 1));
    Do(TestTransfer::Out(BulkOutEndpoint, {42}));
    TestTransfer bulk = TestTransfer::In(BulkInEndpoint, 64);
    TestTransfer interrupt = TestTransfer::In(InterruptInEndpoint, 1);
    instrument_.Submit(bulk);
    instrument_.Submit(interrupt);
    instrument_.Unplug();
    for (const TestTransfer* transfer : {&bulk, &interrupt}) {
        EXPECT_EQ(1, transfer->completions);
        EXPECT_EQ(TransferStatus::DeviceGone, transfer->status);
    }
    TestTransfer after = TestTransfer::In(BulkInEndpoint, 64);
    EXPECT_EQ(Errors::DeviceNotConnected, instrument_.Submit(after));
    EXPECT_EQ(Errors::DeviceNotConnected, instrument_.Claim());
    EXPECT_EQ(0, after.completions);

    instrument_.PlugIn();
    EXPECT_EQ(Errors::Success, instrument_.Claim());
    instrument_.WithCommands([](const Commands& state) {
        EXPECT_EQ(MeasureParameters(), state.parameters);
        EXPECT_EQ(42, state.eeprom[100]);
    });
}

TEST(SimulatedConnectionTest, EachOpeningHasItsOwnClaimAndTransfers) {
    ManualScheduler scheduler;
    const auto instrument = std::make_shared<SimulatedInstrument>(scheduler);
    const auto other = SimulatedInstrument::Connect(instrument);
    TestTransfer pending = TestTransfer::In(BulkInEndpoint, 64);
    TestTransfer ofOther = TestTransfer::In(InterruptInEndpoint, 1);
    {
        const auto connection = SimulatedInstrument::Connect(instrument);
        EXPECT_EQ(Errors::Success, connection->Claim());
        EXPECT_EQ(Errors::Busy, other->Claim());
        other->Release();
        EXPECT_EQ(Errors::Busy, other->Claim()) << "only the owner gives a claim back";
        connection->Submit(pending);
        other->Submit(ofOther);
    }
    EXPECT_EQ(TransferStatus::Cancelled, pending.status) << "closing ends its own transfers";
    EXPECT_EQ(1, pending.completions);
    EXPECT_EQ(0, ofOther.completions);
    EXPECT_EQ(Errors::Success, other->Claim());

    instrument->Unplug();
    instrument->PlugIn();
    EXPECT_EQ(TransferStatus::DeviceGone, ofOther.status);
    EXPECT_EQ(Errors::DeviceNotConnected, other->Claim())
        << "it was opened before the instrument was unplugged";
    EXPECT_EQ(Errors::Success, SimulatedInstrument::Connect(instrument)->Claim());
}

}  // namespace
}  // namespace Varnholt::Simulator
