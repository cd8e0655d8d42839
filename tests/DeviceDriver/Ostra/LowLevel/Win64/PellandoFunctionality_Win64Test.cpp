#include <atomic>

#include "DeviceDriver/Ostra/LowLevel/Win64/PellandoFunctionality_Win64.h"
#include "Platform/Time.h"
#include "Protocol/Instrument.h"
#include "Protocol/UsbIoDriver.h"
#include "Support/DriverTest.h"

namespace Varnholt::Tests {
namespace {

using namespace Protocol::UsbIoDriver;
using namespace DeviceDriver::Ostra::LowLevel;
using Protocol::BulkInEndpoint;

/// A host on which USBIO is the transport.
class UsbIoTest : public DriverTest {
  protected:
    UsbIoTest() : DriverTest(TestTime::RealForThreadSanitizer, {"usbio/1", "usbio/2", "usbio/3"}) {
        Platform::Override64BitHost(true);
    }
    ~UsbIoTest() override { EXPECT_EQ(driver_.OpenFiles(), 0U); }

    Lines TakeTranscript() { return WithoutListener(driver_.TakeTranscript()); }
    void ExpectFailure(const std::string& text, std::uint32_t index) {
        ExpectThrow<IOException>(text, [index] { PellandoFunctionality_Win64 instrument(nullptr, index); });
        EXPECT_EQ(driver_.OpenFiles(), 0U) << text;
    }
};

using UsbIoOpening = UsbIoTest;

TEST_F(UsbIoOpening, ConfiguresTheInstrumentThatWasAskedFor) {
    Bytes configuration(260);
    configuration[2] = configuration[10] = 1;
    const std::string ask = "control 8094206C / [12]";
    Lines expected;
    for (const std::string listed :
         {"usbio/1", "usbio/2", "usbio/3", "usbio/1"}) {  // the last one: the search
        expected.insert(expected.end(), {"open " + listed, ask, "close " + listed});
    }
    expected.insert(expected.end(),
                    {"open usbio/2", ask, "control 80942028 /",
                     "control 80942024 " + Hex(configuration.data(), configuration.size()) + " /",
                     "control 8094203C / [8]", "control 80942040 11 00 00 00 00 00 00 00 /"});
    for (const std::string endpoint : {"03", "82", "84"}) {
        expected.insert(expected.end(), {"open usbio/2", ask, "control 80942078 " + endpoint + " /"});
    }
    const PellandoFunctionality_Win64 instrument(nullptr, 1);
    EXPECT_THAT(TakeTranscript(), ElementsAreArray(expected));
}

TEST_F(UsbIoOpening, EachOfItsStepsCanFail) {
    const std::pair<const char*, std::uint32_t> steps[] = {
        {"UnconfigureDevice", Control::UnconfigureDevice},
        {"SetConfiguration", Control::SetConfiguration},
        {"GetDeviceParameters", Control::GetDeviceParameters},
        {"SetDeviceParameters", Control::SetDeviceParameters},
        {"BindTX", Control::BindPipe},
        {"BindRX", Control::BindPipe},
        {"BindIR", Control::BindPipe},
    };
    int bindings = 0;
    for (const auto& [operation, code] : steps) {
        for (int i = 0; i < bindings; ++i) {
            driver_.Script(code, {});
        }
        bindings += code == Control::BindPipe ? 1 : 0;
        driver_.Script(code, {.code = Status::AlreadyConfigured});
        ExpectFailure(std::string("Error in UsbIo function: \"") + operation +
                          "\" Error: Error code 0xE0001005: USB device is already configured.",
                      0);
    }
    // The search stops at the first device that does not open.
    for (const auto& [opened, text] :
         {std::pair{1, "No such device connected"}, {3, "requested device not found"}}) {
        for (int i = 0; i < opened; ++i) {
            driver_.Script(Control::GetDriverInfo, {.data = {0x30, 0x02}});
        }
        driver_.Script(Control::GetDriverInfo, {.code = 31});
        ExpectFailure(text, 1);
    }
    FailCalls("MakeList", Platform::Errors::NoSystemResources, 2);
    ExpectFailure("Unable to create device list.", 0);
}

constexpr std::uint32_t Whole = 65536;

class UsbIoScan : public UsbIoTest {
  protected:
    UsbIoScan() {
        Platform::ObserveBeeps([this](std::uint32_t hertz, std::uint32_t milliseconds) {
            beeps_ += hertz == 2140 && milliseconds == 75 ? 1 : 1000;
            Platform::SignalEvent(beeped_.Get());
        });
        TakeTranscript();
    }
    ~UsbIoScan() override { Platform::ObserveBeeps({}); }

    /// The instrument sends the stream in transfers of these sizes, one after the other.
    void Send(const std::vector<std::uint32_t>& sizes, std::uint32_t after) {
        std::size_t sent = 0;
        for (const std::uint32_t size : sizes) {
            const Bytes all = CountingImage(0, sent + size);
            driver_.Script(
                BulkInEndpoint,
                {.data = Bytes(all.begin() + static_cast<std::ptrdiff_t>(sent), all.end()), .after = after});
            sent += size;
        }
    }
    Bytes TakeAll(std::uint32_t piece = 256) {
        Bytes all, part(piece);
        for (std::uint32_t size = piece; size != 0;) {
            instrument_.GetScanData(part.data(), &size);
            all.insert(all.end(), part.data(), part.data() + size);
        }
        return all;
    }
    void ExpectRefusal(const std::string& text, std::uint32_t total) {
        ExpectThrow<DataException>(text, [&] { instrument_.StartScan(256, 1, total); });
        EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
        EXPECT_EQ(TakeAll(), Bytes());
    }

    std::atomic<int> beeps_ = 0;
    Platform::OwnedHandle beeped_{Platform::MakeAutoResetEvent()};
    PellandoFunctionality_Win64 instrument_{nullptr, 0};
};

TEST_F(UsbIoScan, FixedScansEndWithTheirSizeOrAShortTransfer) {
    // The instrument sends these transfers and is asked for those reads.
    const std::vector<
        std::tuple<const char*, std::uint32_t, std::vector<std::uint32_t>, Lines, std::uint32_t>>
        cases{
            {"two transfers", 100000, {Whole, 34464, 0}, {"65536", "34464", "0", "0"}, 100000},
            {"short at once", 100000, {10}, {"65536", "34464"}, 10},
            {"empty at once", 100000, {0}, {"65536", "34464"}, 0},
            {"a whole transfer", Whole, {Whole, 0}, {"65536", "0", "0"}, Whole},
            {"a byte more", Whole + 1, {Whole, 1, 0}, {"65536", "1", "0", "0"}, Whole + 1},
        };
    for (const std::uint32_t after : {0U, 1U}) {
        for (const auto& [name, total, transfers, reads, end] : cases) {
            SCOPED_TRACE(name);
            driver_.DropScript(BulkInEndpoint);
            TakeTranscript();
            Send(transfers, after);
            instrument_.StartScan(256, 1, total);
            Lines expected{"control 80942035 00 00 00 00 02 00 00 00 00 00 00 00 00 C0 00 00 00 00 /"};
            for (const std::string& size : reads) {
                expected.push_back("read 82 [" + size + "]");
            }
            expected.emplace_back("cancel 82");
            EXPECT_THAT(TakeTranscript(), ElementsAreArray(expected));
            EXPECT_EQ(TakeAll(), CountingImage(0, end));
            EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
        }
    }
    EXPECT_EQ(beeps_, 0);
}

TEST_F(UsbIoScan, OpenEndedScansGrowAndBeepOnceEach) {
    int beeps = 0;
    for (const std::uint32_t total : {0U, Whole, 1280000U, 2000000U}) {
        std::vector<std::uint32_t> transfers(total / Whole, Whole);
        transfers.push_back(total % Whole);
        Send(transfers, total % 3);
        const Stopwatch stopwatch(clock_);
        instrument_.StartScan(256, 1, 0);
        EXPECT_LT(stopwatch.Milliseconds(), 300U) << "a scan does not wait for its beep";
        EXPECT_EQ(TakeAll(100000), CountingImage(0, total)) << total;
        EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
        ASSERT_EQ(Platform::Wait(beeped_.Get(), 10000), Platform::WaitResult::Signalled);
        stopwatch.Expect(370);
        EXPECT_EQ(beeps_, ++beeps);
    }
}

/// No driver should report more than a read asked for; where one does, a fixed scan stays within its size.
TEST_F(UsbIoScan, MoreThanWasAskedForIsRefused) {
    const Answer tooMuch{.data = Bytes(100), .after = 1, .count = 101};
    driver_.Script(BulkInEndpoint, tooMuch);
    ExpectRefusal("buffer size is fix", 100);
    Send({5000, 0}, 1);
    instrument_.StartScan(256, 1, 5000);
    driver_.Script(BulkInEndpoint, tooMuch);
    ExpectRefusal("more bytes read than expected", 100);  // now there would be room for it

    struct : ScanReceiver {
        void Receive(std::span<const std::uint8_t> data) override { received += data.size(); }
        std::size_t received = 0;
    } receiver;
    ScanReceiver* const receivers[] = {nullptr, &receiver};
    for (ScanReceiver* const each : receivers) {
        instrument_.SetScanReceiver(each);
        Send({5000, 0}, 1);
        instrument_.StartScan(256, 1, 5000);
    }
    EXPECT_EQ(TakeAll(), Bytes()) << "neither of this scan nor of the one before";
    Send({Whole}, 1);
    driver_.Script(BulkInEndpoint, tooMuch);
    ExpectRefusal("more bytes read than expected", Whole + 100);
    EXPECT_EQ(receiver.received, 5000 + Whole);
}

}  // namespace
}  // namespace Varnholt::Tests
