#include "Protocol/ByteOrder.h"
#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using Cli::ExitCode;
using testing::HasSubstr;

constexpr std::size_t RecordSize = 256;

Simulator::InstrumentSettings Streaming(std::uint64_t bytes, std::uint64_t bytesPerSecond = 0) {
    return {.scanBytes = bytes, .bytesPerSecond = bytesPerSecond};
}

class ScanTest : public ToolTest {
  protected:
    std::vector<std::uint8_t> ScanRaw(const std::string& options) {
        Succeed("scan --raw --output @raw " + options);
        return ReadFile(folder_.Path("raw"));
    }
    /// The simulated sensor numbers its records in their last two bytes.
    static void ExpectRecordsInOrder(const std::vector<std::uint8_t>& bytes) {
        for (std::size_t i = 0; (i + 1) * RecordSize <= bytes.size(); ++i) {
            ASSERT_EQ(Protocol::LoadBig16(bytes.data() + (i + 1) * RecordSize - 2), i % 251 % 65536);
        }
    }
};
OSTRA_ON_BOTH_TRANSPORTS(ScanTest);

TEST_P(ScanTest, TotalsAreWhatTheTransportCanAskFor) {
    host_.Add("sim", Streaming(10'000'000));
    EXPECT_EQ(ScanRaw("--total 5120").size(), 5120u);
    if (GetParam() == Transport::UsbIo) {
        EXPECT_EQ(ScanRaw("--total 1000").size(), 1000u);
    } else {
        Fail("scan --total 1000", ExitCode::Usage, "1000 is none of 256");
    }
}

TEST_P(ScanTest, CsvHasTheNumbersAndTheColumnsThatAreAskedFor) {
    host_.Add("sim", Streaming(8 * RecordSize, 2048));
    const auto bytes = ScanRaw("");
    std::string values, names;
    for (std::size_t i = 0; i < RecordSize; i += 2) {
        const int value = Protocol::LoadBig16(bytes.data() + i);
        values += (i > 0 ? "," : "") + std::to_string(value > 0xF800 ? value - 0x10000 : value);
        names += (i > 0 ? "," : "") + std::to_string(i / 2);
    }
    // The first transfer holds two records, or all of them.
    const std::string when = GetParam() == Transport::Native ? "0.2..," : "1.0..,";
    for (const auto& [options, head, first] : std::vector<std::tuple<std::string, std::string, std::string>>{
             {"", "", values},
             {"--output -", "", values},
             {"--header", names, values},
             {"--header --number", "record," + names, "1," + values},
             {"--header --time", "seconds," + names, when + values},
             {"--number --time", "", "1," + when + values},
         }) {
        host_.Add("sim", Streaming(8 * RecordSize, 2048));
        Succeed("scan " + options);
        EXPECT_THAT(tool_.Err(), HasSubstr("8 records of 256 bytes"));
        auto lines = tool_.Lines();
        if (!head.empty()) {
            ASSERT_FALSE(lines.empty());
            EXPECT_EQ(lines.front(), head);
            lines.erase(lines.begin());
        }
        ASSERT_EQ(lines.size(), 8u);
        EXPECT_THAT(lines.front(), testing::MatchesRegex(first));
    }
}

/// However the data are cut into transfers.
TEST_P(ScanTest, OtherRecordSizes) {
    host_.Add("sim", Streaming(100'000));
    const auto all = ScanRaw("--record-size 2");
    ASSERT_EQ(all.size(), 100'000u);
    for (const std::size_t recordSize : {8u, 254u, 6552u}) {
        host_.Add("sim", Streaming(100'000));  // the same noise once more
        const std::string options = "--record-size " + std::to_string(recordSize) + " --records " +
                                    std::to_string(100'000 / recordSize);
        const auto raw = ScanRaw(options);
        EXPECT_EQ(raw.size(), 100'000 / recordSize * recordSize);
        EXPECT_TRUE(std::equal(raw.begin(), raw.end(), all.begin())) << recordSize;
        host_.Add("sim", Streaming(100'000));
        Succeed("scan --number " + options);
        std::string csv;
        for (std::size_t i = 0; i < raw.size(); i += 2) {
            const int value = Protocol::LoadBig16(raw.data() + i);
            csv += i % recordSize == 0 ? std::to_string(i / recordSize + 1) + ',' : "";
            csv += std::to_string(value > 0xF800 ? value - 0x10000 : value);
            csv += (i + 2) % recordSize == 0 ? '\n' : ',';
        }
        EXPECT_EQ(tool_.Out(), csv);
    }
}

#if !defined(_WIN32)
/// What cannot be written is not taken for data that did not come.
TEST_P(ScanTest, ToAFullDisk) {
    auto& instrument = host_.Add("sim", Streaming(100'000));
    Fail("scan --raw --record-size 1000 --total 100000 --output /dev/full", ExitCode::File,
         "ostra: cannot write /dev/full");
    EXPECT_EQ(instrument.WithCommands([](const auto& commands) { return commands.resets; }), 2U);
}
#endif

TEST_P(ScanTest, ProgressOnATerminalAndASummary) {
    tool_.errFacts.isTerminal = tool_.errFacts.movesCursor = true;
    host_.Add("sim", Streaming(1'000'000));
    Succeed("scan --total 512000 --json --output @csv");
    EXPECT_THAT(tool_.Err(), HasSubstr("512.0 kB of 512.0 kB"));
    EXPECT_EQ(tool_.Json()["records"], 2000);
    EXPECT_EQ(tool_.Json()["file"], folder_.Path("csv"));
    EXPECT_EQ(tool_.Json()["ended"], "complete");
    Succeed("eeprom check");
    EXPECT_THAT(tool_.Err(), HasSubstr("reading  [========================]  8.2 kB of 8.2 kB"));
}

/// Whatever ends a scan too early: what came is kept, as whole records, and the exit code and the text say
/// why it ended. The instrument can be used afterwards.
TEST_P(ScanTest, WhatCameIsKept) {
    const auto interrupt = [this] { tool_.interruption.Request(); };
    const auto unplug = [this] { host_.Bus().Unplug("sim"); };
    const auto nothing = [] {};
    // The event comes after 5 s.
    for (const auto& [faults, event, code, ended, text, hasRecords] : std::vector<
             std::tuple<const char*, std::function<void()>, ExitCode, std::string, const char*, bool>>{
             {"", interrupt, ExitCode::Interrupted, "interrupted", "scan interrupted; ", true},
             {"", unplug, ExitCode::NoInstrument, "unplugged", "", true},
             {"bulk-in 4+:silent", nothing, ExitCode::Timeout, "timeout", "", true},
             {"bulk-in 0+:silent", nothing, ExitCode::Timeout, "timeout", "; nothing was recorded", false},
             {"bulk-in 4:stall", nothing, ExitCode::InputOutput, "failed", "", true},
             {"bulk-in 4:short=1000", nothing, ExitCode::InputOutput, "short", " of 6400000 bytes came; ",
              true},
         }) {
        for (const std::string how : {"counted", "discarded", "open-ended"}) {
            if (how == "open-ended" && ended == "short") {
                continue;  // it is as long as the instrument makes it
            }
            SCOPED_TRACE(ended + ", " + how + " " + faults);
            auto& instrument = host_.Add("sim", Streaming(100'000'000, 100'000));
            SetFaults(faults);
            After(5'000'000, event);
            const Stopwatch watch(clock_);
            Fail(std::string("scan --raw --json --timeout 2 --output @raw") +
                     (how == "discarded" ? " --discard" : "") +
                     (how != "open-ended" ? " --records 25000" : ""),
                 code, text);
            watch.ExpectAtMost(code == ExitCode::Interrupted ? 5'100 : 25'000);
            ForgetEvents();
            EXPECT_EQ(tool_.Json()["ended"], ended);

            const bool isKept = hasRecords && how != "discarded";
            const std::string kept = folder_.Path("raw");
            EXPECT_EQ(tool_.Json()["file"], isKept ? nlohmann::json(kept) : nlohmann::json());
            if (isKept) {
                const auto bytes = ReadFile(kept);
                EXPECT_GT(bytes.size(), 0u);
                EXPECT_EQ(bytes.size(), tool_.Json()["records"].get<std::size_t>() * RecordSize);
                EXPECT_LT(tool_.Json()["bytes"].get<std::size_t>() - bytes.size(), RecordSize);
                ExpectRecordsInOrder(bytes);
                EXPECT_THAT(tool_.Err(), HasSubstr(std::to_string(bytes.size() / RecordSize) +
                                                   " records were written to " + kept));
                std::filesystem::remove(kept);
            }
            EXPECT_EQ(folder_.Files().size(), 0u);
            EXPECT_EQ(instrument.PendingTransfers(), 0u);
            EXPECT_FALSE(instrument.Claimed());
            if (code == ExitCode::Interrupted) {
                EXPECT_EQ(instrument.WithCommands([](const auto& commands) { return commands.resets; }), 2u);
                Succeed("readout");
            }
        }
    }
}

/// With what a transfer that is given up has brought.
TEST_P(ScanTest, EveryByteBeforeTheEndCounts) {
    const bool isNative = GetParam() == Transport::Native;
    const std::size_t first = isNative ? 10 * RecordSize : 65536;  // of a counted scan's transfers
    for (const auto& [faults, options, bytes, code] :
         std::vector<std::tuple<const char*, std::string, std::size_t, ExitCode>>{
             {"bulk-in 2:silent", "--records 1000", 2 * first, ExitCode::Timeout},
             {"bulk-in 2:late-cancel", "--records 1000", 3 * first, ExitCode::Timeout},
             {"bulk-in 2:late-cancel", "", isNative ? 22 * RecordSize : 3 * first, ExitCode::Timeout},
             {"bulk-in 1:short=300", "", (isNative ? 2 * RecordSize : first) + 300,
              isNative ? ExitCode::InputOutput : ExitCode::Success},
         }) {
        SCOPED_TRACE(faults + options);
        host_.Add("sim", Streaming(1000 * RecordSize));
        SetFaults(faults);
        const Stopwatch watch(clock_);
        EXPECT_EQ(tool_.Run("scan --raw --json --timeout 1 --output @raw " + options), code);
        // The opening takes a second, and a transfer is given up three behind the time-out.
        watch.ExpectBetween(code == ExitCode::Timeout ? 5'000 : 1'000, 5'100);
        EXPECT_EQ(tool_.Json()["bytes"], bytes);
        ExpectRecordsInOrder(ReadFile(folder_.Path("raw")));
        std::filesystem::remove(folder_.Path("raw"));
    }
}

/// Wherever it comes: while the instrument is opened, waited for, scanned, closed.
TEST_P(ScanTest, CtrlCAtAnyTime) {
    host_.Add("sim", Streaming(102'400, 40'000));
    for (std::uint64_t after = 0; after < 4'000; after += 100) {
        SCOPED_TRACE(after);
        After(after * 1000, [this] { tool_.interruption.Request(); });
        const Stopwatch watch(clock_);
        const ExitCode code = tool_.Run("scan --raw --output @raw");
        ForgetEvents();
        watch.ExpectAtMost(code == ExitCode::Interrupted ? after + 50 : 8'000);
        // The scan ends by itself after 3.6 s.
        EXPECT_TRUE(code == ExitCode::Interrupted || (code == ExitCode::Success && after > 3'000));
        if (const auto files = folder_.Files(); !files.empty()) {
            EXPECT_EQ(files, std::vector<std::string>{"raw"});
            const auto bytes = ReadFile(folder_.Path("raw"));
            EXPECT_GT(bytes.size(), 0u);
            EXPECT_EQ(bytes.size() % RecordSize, 0u);
            ExpectRecordsInOrder(bytes);
            std::filesystem::remove(folder_.Path("raw"));
        }
    }
    Succeed("scan --output @csv");
}

}  // namespace
}  // namespace Varnholt::Tests
