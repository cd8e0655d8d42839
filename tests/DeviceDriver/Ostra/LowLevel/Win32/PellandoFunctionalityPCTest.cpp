#include <functional>

#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoFunctionality_PC.h"
#include "NativeTest.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Ostra::LowLevel::Bytes2;
using DeviceDriver::Ostra::LowLevel::PellandoFunctionality_PC;
using testing::ElementsAre;
using testing::IsEmpty;

class NativeCommands : public NativeTest {
  protected:
    void SetUp() override {
        WaitUntil([this] { return IsListening(); });
        driver_.TakeTranscript();
    }
    PellandoFunctionality_PC instrument_{nullptr, 0};
};

TEST_F(NativeCommands, SendWhatEarlierCommandsLeft) {
    Bytes2 value{0x77, 0x1F};
    std::uint8_t p4 = 0, p5 = 0;
    driver_.Script(0, {.data = Counting(8, 0xA1)});
    instrument_.GetMeasureParameters(value, value, value, p4, p5);
    instrument_.SetMeasureParameters({}, {}, {}, 0);
    instrument_.Reset({0x77, 0x1F});
    driver_.Script(0, {.data = {}});  // nothing answered: the left-over bytes come back
    instrument_.ReadCPLD(value);
    EXPECT_THAT(value, ElementsAre(0x1F, 0x1F));
    const std::uint8_t image = 0x99;
    instrument_.DownloadRAMFirmware(0x1234, &image, 1);
    instrument_.SetMeasureMode(1);
    EXPECT_THAT(driver_.TakeTransfers(),
                ElementsAre("control 22000D 01 02 00 00 C2 00 00 00 00 00 / [8]",
                            "control 22000D 00 02 00 00 C1 00 00 00 00 00 / 00 00 00 00 00 00 00 A8",
                            "control 22000D 00 02 00 00 CA 00 00 00 00 00 / 1F",
                            "control 22000D 01 02 00 00 C8 00 00 00 00 00 / [2]",
                            "control 22000D 00 02 00 00 A0 00 34 12 00 00 / 99",
                            "control 22000D 00 02 00 00 CF 00 34 12 00 00 / 01"));
}

TEST_F(NativeCommands, GiveTheirTransfersTheirTime) {
    const Bytes data(256);
    const auto write = [&] { instrument_.WriteEEPROM({}, {}, data.data(), 256); };
    const struct {
        const char* name;
        std::function<void()> run;
        std::uint32_t pipe;
        std::size_t answeredBefore;
        std::uint64_t milliseconds;
    } cases[] = {
        {"write", write, 2, 0, 2560 + 5000},
        {"end of a write", write, 2, 2, 5000},
        {"scan", [&] { instrument_.StartScan(5, 2, 0); }, 1, 0, 2000 + 3000},
        {"counted scan", [&] { instrument_.StartScan(5, 2, 50); }, 1, 0, 2000 + 3000},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        for (std::size_t i = 0; i < row.answeredBefore; ++i) {
            driver_.Script(row.pipe, {});
        }
        driver_.Script(row.pipe, {.after = Never});
        const Stopwatch watch(clock_);
        EXPECT_THROW(row.run(), IOException);
        watch.Expect(1 + row.milliseconds);
    }
}

Bytes NextRecord(PellandoFunctionality_PC& instrument, std::uint32_t size) {
    Bytes buffer(size);
    instrument.GetScanData(buffer.data(), &size);
    buffer.resize(size);
    return buffer;
}

TEST_F(NativeCommands, HandOutTheRecordsOfAScan) {
    driver_.Script(1, {.data = Counting(10, 1)});
    driver_.Script(1, {.data = Counting(10, 11)});
    instrument_.StartScan(5, 1, 0);
    EXPECT_EQ(driver_.TakeTransfers().front(), "control 22000D 00 02 00 00 C0 00 00 00 00 00 /");
    EXPECT_EQ(NextRecord(instrument_, 5), Counting(5, 1));
    EXPECT_EQ(NextRecord(instrument_, 3), Counting(3, 6)) << "a smaller buffer takes the record's beginning";
    EXPECT_EQ(NextRecord(instrument_, 8), Counting(5, 11))
        << "a larger one gets no more than the record holds";
    EXPECT_EQ(NextRecord(instrument_, 5), Counting(5, 16));
    EXPECT_THAT(NextRecord(instrument_, 5), IsEmpty());

    driver_.Script(1, {.data = Counting(50, 1)});
    driver_.Script(1, {.data = Counting(10, 51)});
    instrument_.StartScan(5, 1, 60);
    EXPECT_EQ(NextRecord(instrument_, 5), Counting(5, 1));
    driver_.Script(1, {.data = Counting(5, 0x71)});
    instrument_.StartScan(5, 1, 0);
    EXPECT_EQ(NextRecord(instrument_, 5), Counting(5, 0x71)) << "a new scan begins with an empty list";
    EXPECT_THAT(NextRecord(instrument_, 5), IsEmpty());

    driver_.Script(1, {.data = Counting(10, 1)});
    ExpectThrow<IOException>("Read data failed (OverlappedRead)", [&] { instrument_.StartScan(5, 1, 0); });
    EXPECT_THAT(NextRecord(instrument_, 5), IsEmpty()) << "what came before the failure is discarded";
}

TEST(NativeCommandsOpening, NamesTheMissingInstrument) {
    const TestClock clock(TestTime::Virtual);
    const struct {
        std::vector<std::string> paths;
        std::uint32_t index;
        const char* text;
    } cases[] = {{{}, 0, "No devices connected"},
                 {{"native/1", "native/2"}, 2, "No such device connected"},
                 {{"native/1", "native/2"}, 0xFFFFFFFF, "No such device connected"}};
    for (const auto& row : cases) {
        ScriptedDriver driver(row.paths);
        const ScopedDeviceFiles files(driver);
        ExpectThrow<IOException>(row.text, [&] { PellandoFunctionality_PC(nullptr, row.index); });
        EXPECT_THAT(driver.TakeTranscript(), IsEmpty());
    }
    ScriptedDriver driver({"native/1", "native/2"});
    const ScopedDeviceFiles files(driver);
    std::string identifier;
    PellandoFunctionality_PC(nullptr, 1).GetDeviceIdentifier(identifier);
    EXPECT_EQ(identifier, "native/2");
    EXPECT_EQ(driver.OpenFiles(), 0u);
}

}  // namespace
}  // namespace Varnholt::Tests
