#include <functional>

#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoFunctionality_PC.h"
#include "NativeTest.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Ostra::LowLevel::Bytes2;
using DeviceDriver::Ostra::LowLevel::Bytes4;
using DeviceDriver::Ostra::LowLevel::PellandoFunctionality_PC;
using testing::ElementsAre;
using testing::IsEmpty;
using Lines = std::vector<std::string>;

class NativeCommands : public NativeTest {
  protected:
    void SetUp() override {
        WaitUntil([this] { return IsListening(); });
        driver.TakeTranscript();
    }
    PellandoFunctionality_PC instrument{nullptr, 0};
};

using Instrument = PellandoFunctionality_PC;

struct Command {
    const char* name;
    Lines transcript;
    Bytes answer;                           ///< of the instrument, in the data stage or as bulk data
    std::function<Bytes(Instrument&)> run;  ///< gives what the command handed out, in the order of the wire
};

const Bytes2 P1{0x01, 0x2C}, P2{0x03, 0x04}, P3{0x05, 0x06};
const Bytes4 Address{0x00, 0x00, 0x10, 0x00};
const Bytes Image = Counting(3, 0x31);

const Command Commands[] = {
    {"SetMeasureParameters",
     {"control 22000D 00 02 00 00 C1 00 00 00 00 00 / 01 2C 03 04 05 06 07 00"},
     {},
     [](Instrument& i) { return i.SetMeasureParameters(P1, P2, P3, 7), Bytes(); }},
    {"GetMeasureParameters",
     {"control 22000D 01 02 00 00 C2 00 00 00 00 00 / [8]"},
     Counting(8, 0xA1),
     [](Instrument& i) {
         Bytes2 p1, p2, p3;
         std::uint8_t p4, p5;
         i.GetMeasureParameters(p1, p2, p3, p4, p5);
         return Bytes{p1[0], p1[1], p2[0], p2[1], p3[0], p3[1], p4, p5};
     }},
    {"SetMeasureMode",
     {"control 22000D 00 02 00 00 CF 00 00 00 00 00 / 42"},
     {},
     [](Instrument& i) { return i.SetMeasureMode(0x42), Bytes(); }},
    {"GetMeasureMode",
     {"control 22000D 01 02 00 00 D1 00 00 00 00 00 / [6]"},
     Counting(6, 0x51),
     [](Instrument& i) {
         Bytes m(6);
         i.GetMeasureMode(m[0], m[1], m[2], m[3], m[4], m[5]);
         return m;
     }},
    {"MeasureRequest",
     {"control 22000D 00 02 00 00 C0 00 00 00 00 00 / ", "read 1 [4]"},
     Counting(4, 0x61),
     [](Instrument& i) {
         Bytes buffer(4);
         i.MeasureRequest(buffer.data(), 4, 1);
         return buffer;
     }},
    {"WriteEEPROM",
     {"control 22000D 00 02 00 00 C3 00 00 00 00 00 / 00 00 10 00 00 03 00 00", "write 2 31 32 33",
      "write 2 00", "write 2 00"},
     {},
     [](Instrument& i) {
         return i.WriteEEPROM(Address, {0, 3}, Image.data(), 3), Bytes();
     }},
    {"ReadEEPROM",
     {"control 22000D 00 02 00 00 C4 00 00 00 00 00 / 00 00 10 00 00 40 00 00", "read 1 [64]"},
     Counting(64),
     [](Instrument& i) {
         Bytes data(64);
         i.ReadEEPROM(Address, {0, 64}, data.data(), 64);
         return data;
     }},
    {"WriteCPLD",
     {"control 22000D 00 02 00 00 C7 00 00 00 00 00 / 01 2C 03 04 05 06"},
     {},
     [](Instrument& i) { return i.WriteCPLD(P1, P2, P3), Bytes(); }},
    {"ReadCPLD",
     {"control 22000D 01 02 00 00 C8 00 00 00 00 00 / [2]"},
     {0x12, 0x34},
     [](Instrument& i) {
         Bytes2 value;
         i.ReadCPLD(value);
         return Bytes(value.begin(), value.end());
     }},
    {"DownloadRAMFirmware",
     {"control 22000D 00 02 00 00 A0 00 34 12 00 00 / 31 32 33"},
     {},
     [](Instrument& i) { return i.DownloadRAMFirmware(0x1234, Image.data(), 3), Bytes(); }},
    {"DownloadEEPROMFirmware",
     {"control 22000D 00 02 00 00 CB 00 00 00 00 00 / 00 00 10 00 00 03 00 00", "write 2 31 32 33",
      "write 2 00", "write 2 00"},
     {},
     [](Instrument& i) {
         return i.DownloadEEPROMFirmware(Address, {0, 3}, Image.data(), 3), Bytes();
     }},
    {"GetMISC",
     {"control 22000D 01 02 00 00 C9 00 00 00 00 00 / [8]"},
     Counting(8, 0xB1),
     [](Instrument& i) {
         Bytes2 m2, m4, m5;
         std::uint8_t m1, m3;
         i.GetMISC(m1, m2, m3, m4, m5);
         return Bytes{m2[0], m2[1], m4[0], m4[1], m5[0], m5[1], m1, m3};
     }},
    {"GetChipID",
     {"control 22000D 01 02 00 00 D2 00 00 00 00 00 / [8]"},
     Counting(8, 0xC1),
     [](Instrument& i) {
         Bytes id(8);
         i.GetChipID(id.data());
         return id;
     }},
    {"Reset",
     {"control 22000D 00 02 00 00 CA 00 00 00 00 00 / 1F"},
     {},
     [](Instrument& i) {
         return i.Reset({0x00, 0x1F}), Bytes();
     }},
};

TEST_F(NativeTest, EachCommandOnTheWire) {
    for (const Command& command : Commands) {
        SCOPED_TRACE(command.name);
        Instrument instrument(nullptr, 0);
        WaitUntil([this] { return IsListening(); });
        driver.TakeTransfers();
        const bool isBulk = command.transcript.size() == 2;
        driver.Script(isBulk ? 1 : 0, {.data = command.answer});
        EXPECT_EQ(command.run(instrument), command.answer);
        EXPECT_EQ(driver.TakeTransfers(), command.transcript);
        driver.DropScript(0);
    }
}

TEST_F(NativeCommands, SendWhatEarlierCommandsLeft) {
    const Bytes2 zero{};
    const auto send = [&](const std::function<void()>& command) {
        driver.TakeTransfers();
        command();
        const Lines lines = driver.TakeTransfers();
        return lines.empty() ? std::string() : lines.front();
    };
    const auto setParameters = [&] { instrument.SetMeasureParameters(zero, zero, zero, 0); };
    EXPECT_EQ(send(setParameters), "control 22000D 00 02 00 00 C1 00 00 00 00 00 / 00 00 00 00 00 00 00 00");
    driver.Script(0, {.data = Counting(8, 0xA1)});
    Bytes2 ignored{};
    std::uint8_t p4 = 0, p5 = 0;
    instrument.GetMeasureParameters(ignored, ignored, ignored, p4, p5);
    EXPECT_EQ(send(setParameters), "control 22000D 00 02 00 00 C1 00 00 00 00 00 / 00 00 00 00 00 00 00 A8");

    EXPECT_EQ(send([&] {
                  instrument.Reset({0x77, 0x1F});
              }),
              "control 22000D 00 02 00 00 CA 00 00 00 00 00 / 1F");
    driver.Script(0, {.data = {}});  // nothing answered: the left-over bytes come back
    Bytes2 cpld{};
    instrument.ReadCPLD(cpld);
    EXPECT_THAT(cpld, ElementsAre(0x1F, 0x1F));

    const std::uint8_t image = 0x99;
    instrument.DownloadRAMFirmware(0x1234, &image, 1);
    EXPECT_EQ(send([&] { instrument.SetMeasureMode(1); }),
              "control 22000D 00 02 00 00 CF 00 34 12 00 00 / 01");
}

TEST_F(NativeCommands, StopAtTheFirstTransferThatFails) {
    const Bytes4 address{};
    Bytes data(64);
    const std::function<void()> commands[] = {
        [&] { instrument.MeasureRequest(data.data(), 64, 1); },
        [&] { instrument.StartScan(5, 1, 0); },
        [&] { instrument.StartScan(5, 1, 100); },
        [&] {
            instrument.WriteEEPROM(address, {0, 64}, data.data(), 64);
        },
        [&] {
            instrument.ReadEEPROM(address, {0, 64}, data.data(), 64);
        },
        [&] {
            instrument.DownloadEEPROMFirmware(address, {0, 64}, data.data(), 64);
        }};
    for (const auto& command : commands) {
        driver.TakeTransfers();
        driver.Script(0, {.code = Errors::GeneralFailure});
        ExpectThrow<IOException>("Device IO control failed: " + ErrorSuffix(Errors::GeneralFailure), command);
        EXPECT_EQ(driver.TakeTransfers().size(), 1u) << "the control alone";
    }
    for (const std::size_t failing : {0u, 1u, 2u}) {
        for (std::size_t i = 0; i < failing; ++i) {
            driver.Script(2, {});
        }
        driver.Script(2, {.code = Errors::GeneralFailure});
        ExpectThrow<IOException>("write data failed" + ErrorSuffix(Errors::GeneralFailure), commands[3]);
        EXPECT_EQ(driver.TakeTransfers().size(), 2u + failing);
    }
}

TEST_F(NativeCommands, GiveTheirTransfersTheirTime) {
    const Bytes4 address{};
    Bytes data(256);
    const struct {
        const char* name;
        std::function<void()> run;
        std::uint32_t pipe;
        std::size_t answeredBefore;
        std::uint64_t milliseconds;
    } cases[] = {
        {"MeasureRequest", [&] { instrument.MeasureRequest(data.data(), 256, 1); }, 1, 0, 1000 + 5000},
        {"ReadEEPROM",
         [&] {
             instrument.ReadEEPROM(address, {0, 64}, data.data(), 64);
         },
         1, 0, 64 + 5000},
        {"WriteEEPROM",
         [&] {
             instrument.WriteEEPROM(address, {1, 0}, data.data(), 256);
         },
         2, 0, 2560 + 5000},
        {"WriteEEPROM, end",
         [&] {
             instrument.WriteEEPROM(address, {1, 0}, data.data(), 256);
         },
         2, 2, 5000},
        {"StartScan", [&] { instrument.StartScan(5, 2, 0); }, 1, 0, 2000 + 3000},
        {"StartScan, counted", [&] { instrument.StartScan(5, 2, 50); }, 1, 0, 2000 + 3000},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        for (std::size_t i = 0; i < row.answeredBefore; ++i) {
            driver.Script(row.pipe, {});
        }
        driver.Script(row.pipe, {.after = Never});
        const Stopwatch watch(clock);
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
    driver.Script(1, {.data = Counting(10, 1)});
    driver.Script(1, {.data = Counting(10, 11)});
    instrument.StartScan(5, 1, 0);
    EXPECT_EQ(NextRecord(instrument, 5), Counting(5, 1));
    EXPECT_EQ(NextRecord(instrument, 3), Counting(3, 6)) << "a smaller buffer takes the record's beginning";
    EXPECT_EQ(NextRecord(instrument, 8), Counting(5, 11))
        << "a larger one gets no more than the record holds";
    EXPECT_EQ(NextRecord(instrument, 5), Counting(5, 16));
    EXPECT_THAT(NextRecord(instrument, 5), IsEmpty());

    driver.Script(1, {.data = Counting(50, 1)});
    driver.Script(1, {.data = Counting(10, 51)});
    instrument.StartScan(5, 1, 60);
    EXPECT_EQ(NextRecord(instrument, 5), Counting(5, 1));
    driver.Script(1, {.data = Counting(5, 0x71)});
    instrument.StartScan(5, 1, 0);
    EXPECT_EQ(NextRecord(instrument, 5), Counting(5, 0x71)) << "a new scan begins with an empty list";
    EXPECT_THAT(NextRecord(instrument, 5), IsEmpty());

    driver.Script(1, {.data = Counting(10, 1)});
    ExpectThrow<IOException>("Read data failed (OverlappedRead)", [&] { instrument.StartScan(5, 1, 0); });
    EXPECT_THAT(NextRecord(instrument, 5), IsEmpty()) << "what came before the failure is discarded";
}

TEST_F(NativeCommands, ScanAtRaisedPriorityAndGiveItBack) {
    int during = 0;
    const auto look = [&] { during = CurrentThreadPriority(); };
    const int before = CurrentThreadPriority();
    driver.Script(1, {.data = Counting(5, 1), .onStart = look});
    instrument.StartScan(5, 1, 0);
    EXPECT_EQ(during, HighestThreadPriority);
    EXPECT_EQ(CurrentThreadPriority(), before);

    during = 0;
    driver.Script(1, {.code = Errors::GeneralFailure, .onStart = look});
    EXPECT_THROW(instrument.StartScan(5, 1, 50), IOException);
    EXPECT_EQ(during, HighestThreadPriority);
    EXPECT_EQ(CurrentThreadPriority(), before);
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
