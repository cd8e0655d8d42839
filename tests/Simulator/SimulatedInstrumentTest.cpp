#include "Platform/Threads.h"
#include "SchedulerInForce.h"
#include "SimulatedInstrument.h"
#include "Support/Bytes.h"
#include "Support/TestClock.h"
#include "Support/TestTransfer.h"

namespace Varnholt::Simulator {
namespace {

using namespace Platform::Usb;
using namespace Protocol;
using namespace Tests;

class SimulatedInstrumentTest : public testing::Test {
  protected:
    Bytes ReadEeprom(std::uint32_t address, std::uint16_t length) {
        Do(*device_, TestTransfer::Memory(Request::ReadEeprom, address, length));
        return Do(*device_, TestTransfer::In(BulkInEndpoint, length));
    }
    /// A transfer gets nothing, and ends once with its cancellation.
    void ExpectSilent(std::uint8_t endpoint) {
        TestTransfer transfer = TestTransfer::In(endpoint, 2);
        device_->Submit(transfer);
        EXPECT_EQ(0, transfer.completions);
        EXPECT_EQ(1U, instrument_->PendingTransfers());
        device_->Cancel(transfer);
        device_->Cancel(transfer);
        transfer.ExpectEnd(TransferStatus::Cancelled);
    }

    const TestClock clock_{TestTime::Virtual};  // stands still: what does not end at once does not end
    const std::shared_ptr<SimulatedInstrument> instrument_ =
        std::make_shared<SimulatedInstrument>(Platform::ClockScheduler());
    const std::shared_ptr<UsbDevice> device_ = SimulatedInstrument::Connect(instrument_);
};

TEST_F(SimulatedInstrumentTest, RefusesWhatItCannotDo) {
    const auto out = [](Request request, std::uint16_t value = 0) {
        return SetupPacket{0x40, static_cast<std::uint8_t>(request), value, 0, 0};
    };
    constexpr auto part = &TestTransfer::AddressAndLength;
    for (const auto& [name, request, data] : std::vector<std::tuple<const char*, SetupPacket, Bytes>>{
             {"unknown request", {0x40, 0x99, 0, 0, 0}, {}},
             {"unknown question", {0xC0, 0x99, 0, 0, 8}, Bytes(8)},
             {"class request", {0x21, 0xC0, 0, 0, 0}, {}},
             {"vendor request to an interface", {0x41, 0xC0, 0, 0, 0}, {}},
             {"write across the end", out(Request::WriteEeprom), part(8191, 2)},
             {"write far outside", out(Request::WriteEeprom), part(0xFFFFFFFF, 2)},
             {"read across the end", out(Request::ReadEeprom), part(8128, 128)},
             {"RAM firmware across the end", out(Request::DownloadRamFirmware, 0xFFFF), Bytes(2)},
             {"configuration 2", {0x00, 9, 2, 0, 0}, {}},
             {"device qualifier", {0x80, 6, 0x0600, 0, 10}, Bytes(10)},
         }) {
        SCOPED_TRACE(name);
        SetupPacket setup = request;
        setup.length = static_cast<std::uint16_t>(data.size());
        EXPECT_EQ(Bytes(), Do(*device_, TestTransfer::Control(setup, data), TransferStatus::Stalled));
    }
    // A refused setup does not halt endpoint 0.
    EXPECT_EQ(8U, Do(*device_, TestTransfer::VendorQuestion(Request::GetChipId, 8)).size());
}

TEST_F(SimulatedInstrumentTest, AnswersComeOnceAndGoWithTheNextRequest) {
    TestTransfer early = TestTransfer::In(BulkInEndpoint, 256);
    device_->Submit(early);
    EXPECT_EQ(0, early.completions) << "nothing was asked for yet";
    Do(*device_, TestTransfer::Vendor(Request::Measure));
    EXPECT_EQ(256U, early.Data().size());
    // It was taken whole, so an empty transfer tells the end; then the endpoint is silent.
    EXPECT_EQ(0U, Do(*device_, TestTransfer::In(BulkInEndpoint, 256)).size());
    ExpectSilent(BulkInEndpoint);

    Do(*device_, TestTransfer::Vendor(Request::Measure));
    Do(*device_, TestTransfer::In(BulkInEndpoint, 100));
    const Bytes memory = instrument_->Eeprom();
    EXPECT_EQ(Bytes(memory.begin(), memory.begin() + 64), ReadEeprom(0, 64));
    ExpectSilent(BulkInEndpoint);  // memory of a length that the host named has no end mark

    Do(*device_, TestTransfer::Vendor(Request::Measure));
    Do(*device_, TestTransfer::Memory(Request::WriteEeprom, 0, 2));
    Do(*device_, TestTransfer::Vendor(Request::Reset, {31}));
    ExpectSilent(BulkInEndpoint);
    ExpectSilent(BulkOutEndpoint);
}

TEST_F(SimulatedInstrumentTest, UnplugLosesWhatIsVolatile) {
    Do(*device_, TestTransfer::Vendor(Request::SetMeasureParameters, Bytes(8, 9)));
    Do(*device_, TestTransfer::Memory(Request::WriteEeprom, 100, 1));
    Do(*device_, TestTransfer::Out(BulkOutEndpoint, {42}));
    instrument_->Unplug();
    TestTransfer after = TestTransfer::In(BulkInEndpoint, 64);
    EXPECT_EQ(Errors::DeviceNotConnected, device_->Submit(after));
    EXPECT_EQ(Errors::DeviceNotConnected, device_->Claim());
    EXPECT_EQ(0, after.completions);
    instrument_->PlugIn();
    EXPECT_EQ(Errors::DeviceNotConnected, device_->Claim()) << "it was opened before the unplugging";
    EXPECT_EQ(Errors::Success, SimulatedInstrument::Connect(instrument_)->Claim());
    instrument_->WithCommands([](const Commands& state) {
        EXPECT_EQ(MeasureParameters(), state.parameters);
        EXPECT_EQ(42, state.eeprom[100]);
    });
}

/// The clock may be another when the next data are waited for.
TEST(SimulatedConnectionTest, WhatWasDueBeforeAnUnpluggingIsNotWaitedForAfterwards) {
    SchedulerInForce scheduler;
    const auto instrument =
        std::make_shared<SimulatedInstrument>(scheduler, InstrumentSettings{.takesIntegrationTime = true});
    for (const bool isWaitedFor : {false, true}) {
        const TestClock clock(TestTime::Virtual);
        TestTransfer measure = TestTransfer::Vendor(Request::Measure);
        TestTransfer readout = TestTransfer::In(BulkInEndpoint, 256);
        const auto connection = SimulatedInstrument::Connect(instrument);
        connection->Submit(measure);
        connection->Submit(readout);
        Platform::SleepMilliseconds(isWaitedFor ? 1000 : 0);
        EXPECT_EQ(isWaitedFor ? 1 : 0, readout.completions);
        instrument->Unplug();
        instrument->PlugIn();
    }
}

}  // namespace
}  // namespace Varnholt::Simulator
