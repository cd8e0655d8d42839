#include "Platform/EventScheduler.h"
#include "Protocol/ByteOrder.h"
#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using Cli::ExitCode;
using testing::HasSubstr;

constexpr std::size_t RecordSize = 256;

Simulator::InstrumentSettings Streaming(std::uint64_t bytes, std::uint64_t bytesPerSecond = 0) {
    Simulator::InstrumentSettings settings;
    settings.scanBytes = bytes;
    settings.bytesPerSecond = bytesPerSecond;
    return settings;
}

class ScanTest : public ToolTest {
  protected:
    std::vector<std::uint8_t> ScanRaw(Arguments arguments) {
        arguments.insert(arguments.begin(), "scan");
        arguments.insert(arguments.end(), {"--raw", "--output", folder.Path("raw")});
        Succeed(arguments);
        return ReadFile(folder.Path("raw"));
    }
    /// The simulated sensor numbers its records in their last two bytes.
    static void ExpectRecordsInOrder(const std::vector<std::uint8_t>& bytes) {
        for (std::size_t i = 0; (i + 1) * RecordSize <= bytes.size(); ++i) {
            ASSERT_EQ(Protocol::LoadBig16(bytes.data() + (i + 1) * RecordSize - 2), i % 251 % 65536);
        }
    }
};
OSTRA_ON_BOTH_TRANSPORTS(ScanTest);

TEST_P(ScanTest, FixedScansHaveTheirSize) {
    host.Add("sim", Streaming(10'000'000));
    for (const std::size_t records : {1u, 2u, 11u, 300u, 1000u}) {
        const auto bytes = ScanRaw({"--records", std::to_string(records)});
        EXPECT_EQ(bytes.size(), records * RecordSize);
        ExpectRecordsInOrder(bytes);
    }
    EXPECT_EQ(ScanRaw({"--total", "5120"}).size(), 5120u);
    if (GetParam() == Transport::UsbIo) {
        EXPECT_EQ(ScanRaw({"--total", "1000"}).size(), 1000u);
    } else {
        Fail({"scan", "--total", "1000"}, ExitCode::Usage, "1000 is none of 256");
    }
}

TEST_P(ScanTest, OpenEndedScansEndWithTheInstrument) {
    for (const std::size_t records : {1u, 40u, 2560u}) {
        host.Add("sim", Streaming(records * RecordSize));
        const auto bytes = ScanRaw({});
        EXPECT_EQ(bytes.size(), records * RecordSize);
        ExpectRecordsInOrder(bytes);
    }
}

TEST_P(ScanTest, CsvHasOneRecordALineAndTheSameNumbers) {
    host.Add("sim", Streaming(8 * RecordSize));
    const auto bytes = ScanRaw({});
    host.Add("sim", Streaming(8 * RecordSize));
    Succeed({"scan"});
    ASSERT_EQ(tool.Lines().size(), 8u);
    std::string first;
    for (std::size_t i = 0; i < RecordSize; i += 2) {
        const int value = Protocol::LoadBig16(bytes.data() + i);
        first += (i > 0 ? "," : "") + std::to_string(value > 0xF800 ? value - 0x10000 : value);
    }
    EXPECT_EQ(tool.Lines()[0], first);
    EXPECT_THAT(tool.Err(), HasSubstr("8 records of 256 bytes"));
}

TEST_P(ScanTest, OtherRecordSizes) {
    host.Add("sim", Streaming(100'000));
    Succeed({"scan", "--record-size", "8", "--records", "100"});
    EXPECT_EQ(tool.Lines().size(), 100u);
    for (const std::string& line : tool.Lines()) {
        ASSERT_EQ(std::count(line.begin(), line.end(), ','), 3) << line;
    }
    EXPECT_EQ(ScanRaw({"--record-size", "6553", "--records", "3"}).size(), 3u * 6553);
    EXPECT_EQ(tool.Run({"scan", "--record-size", "7"}), ExitCode::Usage) << "no 16-bit values";
}

TEST_P(ScanTest, SummaryAsJson) {
    host.Add("sim", Streaming(4096));
    Succeed({"scan", "--json", "--output", folder.Path("csv")});
    EXPECT_EQ(tool.Json()["records"], 16);
    EXPECT_EQ(tool.Json()["bytes"], 4096);
    EXPECT_EQ(tool.Err(), "");
}

TEST_P(ScanTest, ProgressOnATerminalOnly) {
    tool.errFacts.movesCursor = true;
    host.Add("sim", Streaming(1'000'000));
    Succeed({"scan", "--total", "512000", "--output", folder.Path("csv")});
    EXPECT_THAT(tool.Err(), HasSubstr("512.0 kB of 512.0 kB"));
}

/// Be it that a transfer fails, or that the instrument stops too early.
TEST_P(ScanTest, AFailedScanLeavesTheFileThatWasThere) {
    WriteFile(folder.Path("csv"), {1});
    for (const char* faults : {"bulk-in 5:stall", ""}) {
        host.Add("sim", Streaming(25'600));
        SetFaults(faults);
        Fail({"scan", "--total", "1024000", "--output", folder.Path("csv")}, ExitCode::InputOutput);
        EXPECT_EQ(ReadFile(folder.Path("csv")), std::vector<std::uint8_t>{1});
        EXPECT_EQ(folder.Files().size(), 1u);
    }
    Succeed({"scan", "--total", "10240"});
}

TEST_P(ScanTest, AnInstrumentThatFallsSilentIsATimeout) {
    host.Add("sim", Streaming(10'000'000));
    SetFaults("bulk-in 1+:silent");
    for (const std::vector<std::string>& kind :
         {std::vector<std::string>{"scan", "--timeout", "2"},
          std::vector<std::string>{"scan", "--timeout", "2", "--total", "1024000"}}) {
        const Stopwatch watch(clock);
        EXPECT_EQ(tool.Run(kind), ExitCode::Timeout) << tool.Err();
        watch.ExpectAtMost(20'000);
    }
}

TEST_P(ScanTest, AnUnpluggedInstrumentIsSaidToBe) {
    host.Add("sim", Streaming(100'000'000, 1'000'000));
    After(5'000'000, [&] { host.Bus().Unplug("sim"); });
    Fail({"scan"}, ExitCode::NoInstrument, Identifier());
}

TEST_P(ScanTest, CtrlCEndsAScanAndLeavesTheInstrumentUsable) {
    auto& instrument = host.Add("sim", Streaming(100'000'000, 100'000));
    WriteFile(folder.Path("csv"), {1});
    for (const std::vector<std::string>& kind :
         {std::vector<std::string>{"scan"}, std::vector<std::string>{"scan", "--total", "89600000"}}) {
        Cli::Interruption interruption;
        tool.interruption = &interruption;
        const auto resets = instrument.WithCommands([](const auto& commands) { return commands.resets; });
        const Stopwatch watch(clock);
        After(10'000'000, [&] { interruption.Request(); });
        Arguments arguments = kind;
        arguments.insert(arguments.end(), {"--output", folder.Path("csv")});
        EXPECT_EQ(tool.Run(arguments), ExitCode::Interrupted) << tool.Err();
        watch.ExpectBetween(10'000, 12'500);
        EXPECT_THAT(tool.Err(), HasSubstr("scan interrupted after "));
        EXPECT_EQ(ReadFile(folder.Path("csv")), std::vector<std::uint8_t>{1});
        EXPECT_EQ(instrument.WithCommands([](const auto& commands) { return commands.resets; }), resets + 2);
        EXPECT_EQ(instrument.PendingTransfers(), 0u);
        EXPECT_FALSE(instrument.Claimed());
    }
    tool.interruption = nullptr;
    Succeed({"readout"});
}

/// Wherever it comes: while the instrument is opened, waited for, scanned, closed.
TEST_P(ScanTest, CtrlCAtAnyTime) {
    host.Add("sim", Streaming(102'400, 40'000));
    int interrupted = 0;
    for (std::uint64_t after = 0; after < 4'000; after += 100) {
        Cli::Interruption interruption;
        tool.interruption = &interruption;
        const auto event = After(after * 1000, [&] { interruption.Request(); });
        const Stopwatch watch(clock);
        const ExitCode code = tool.Run({"scan", "--output", folder.Path("csv")});
        Platform::ClockScheduler().Forget(event);
        constexpr std::uint32_t ending = 50;
        watch.ExpectAtMost(code == ExitCode::Interrupted ? static_cast<std::uint32_t>(after) + ending
                                                         : 8'000);
        ASSERT_TRUE(code == ExitCode::Interrupted || code == ExitCode::Success)
            << after << ": " << tool.Err();
        interrupted += code == ExitCode::Interrupted ? 1 : 0;
    }
    EXPECT_GT(interrupted, 20);
    tool.interruption = nullptr;
    Succeed({"scan", "--output", folder.Path("csv")});
}

}  // namespace
}  // namespace Varnholt::Tests
