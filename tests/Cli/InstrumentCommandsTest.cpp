#include <regex>

#include "Interface/Readout.h"
#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using Cli::ExitCode;
using Simulator::InstrumentSettings;
using testing::HasSubstr;

const InstrumentSettings Leisurely{.takesIntegrationTime = true};

class InstrumentCommandsTest : public ToolTest {};
OSTRA_ON_BOTH_TRANSPORTS(InstrumentCommandsTest);

TEST_P(InstrumentCommandsTest, List) {
    Fail("list", ExitCode::NoInstrument, "no instrument is connected");
    EXPECT_EQ(tool_.Out(), "");
    Fail("list --json", ExitCode::NoInstrument);
    EXPECT_EQ(tool_.Json()["instruments"].size(), 0u);

    host_.Add("sim-b");
    host_.Add("sim-a");
    Succeed("list");
    EXPECT_EQ(tool_.Out(),
              "NAME   IDENTIFIER\nsim-a  " + Identifier("sim-a") + "\nsim-b  " + Identifier("sim-b") + "\n");
    EXPECT_EQ(tool_.Err(), "");
    Succeed("list --json");
    EXPECT_EQ(tool_.Out(), std::string("{\"transport\":\"") + Name(GetParam()) +
                               "\",\"instruments\":[{\"identifier\":\"" + Identifier("sim-a") +
                               "\",\"name\":\"sim-a\"},{\"identifier\":\"" + Identifier("sim-b") +
                               "\",\"name\":\"sim-b\"}]}\n");
    const Transport other = GetParam() == Transport::Native ? Transport::UsbIo : Transport::Native;
    EXPECT_EQ(JsonOf(std::string("identify --transport ") + Name(other) + " --json")["identifier"],
              std::string(Name(other)) + "/sim-a");
    EXPECT_EQ(JsonOf("identify --json")["identifier"], Identifier("sim-a"))
        << "the choice was for one command";
}

/// All forms of one readout hold the same values.
TEST_P(InstrumentCommandsTest, ReadoutForms) {
    host_.Add("sim", Leisurely);
    Succeed("readout --raw --output @raw");
    const auto bytes = ReadFile(folder_.Path("raw"));
    ASSERT_EQ(bytes.size(), 256u);
    const auto values = Interface::ReadoutFromBytes(std::span<const std::uint8_t, 256>(bytes.data(), 256));
    host_.Add("sim");  // the same noise once more for each
    EXPECT_THAT(JsonOf("readout --json")["values"].get<std::vector<int>>(),
                testing::ElementsAreArray(values));

    host_.Add("sim");
    Succeed("readout --csv");
    std::string csv = "1,0.000", table;
    for (std::size_t i = 0; i < values.size(); ++i) {
        csv += "," + std::to_string(values[i]);
        table += (i % 8 == 0 ? " " + std::to_string(i) + ":" : "") + " " + std::to_string(values[i]);
    }
    ASSERT_EQ(tool_.Lines().size(), 2u);
    EXPECT_TRUE(tool_.Lines()[0].starts_with("readout,seconds,0,1,2,"));
    EXPECT_TRUE(tool_.Lines()[0].ends_with(",127,time,p1,p2,p3,p4,integrationTime"));
    EXPECT_TRUE(tool_.Lines()[1].starts_with(csv + ",20"));
    EXPECT_TRUE(tool_.Lines()[1].ends_with(",294,0,1,6,0.019992"));

    host_.Add("sim");
    Succeed("readout");
    EXPECT_EQ(tool_.Lines().size(), 17u);
    std::istringstream printed(tool_.Out());
    std::string words;
    for (std::string word; printed >> word && word != "lowest";) {
        words += " " + word;
    }
    EXPECT_TRUE(words.starts_with(table)) << words;
}

/// What the numbers were taken with, and when: from start to start.
TEST_P(InstrumentCommandsTest, ReadoutsSayWhatTheyWereTakenWith) {
    struct Case {
        const char* options;
        nlohmann::json parameters;
        double time;
        int mode;
        int interval = 60;
        std::size_t repeat = 2;
        std::uint16_t firmware = InstrumentSettings().firmware;
    };
    for (const Case& row : {
             Case{"", {294, 0, 1, 6}, 294 * 68e-6, 1, 86340, 52},  // longer than 32 bits count milliseconds
             Case{"--parameters 7,1,2,3", {7, 1, 2, 3}, 7 * 68e-6, 1},
             Case{"--integration-time 0.5", {7353, 0, 1, 6}, 7353 * 68e-6, 1},
             Case{"--integration-time 0.005", {147, 0, 1, 6}, 147 * 34e-6, 2},
             Case{"", {294, 0, 1, 6}, 294 * 68e-6, 1, 60, 2, 300},
         }) {
        auto& instrument = host_.Add("sim", {.firmware = row.firmware, .takesIntegrationTime = true});
        Succeed("ram set 2001=0.0884");  // of which nothing is left
        Succeed("readout --json --repeat " + std::to_string(row.repeat) + " --interval " +
                std::to_string(row.interval) + " " + row.options);
        EXPECT_EQ(tool_.Lines().size(), row.repeat);
        EXPECT_EQ(ModeOf(instrument), row.mode);
        int number = 0;
        int firstMinute = 0;
        for (const std::string& line : tool_.Lines()) {
            const auto readout = nlohmann::json::parse(line);
            EXPECT_EQ(readout["parameters"], row.parameters);
            EXPECT_NEAR(readout["integrationTime"], row.time, 1e-9);
            EXPECT_NEAR(readout["seconds"], row.interval * number, 0.01);
            const std::string time = readout["time"];
            EXPECT_THAT(time, testing::MatchesRegex("20..-..-..T..:..:..\\.......:.."));
            const int minute = std::stoi(time.substr(14, 2));
            firstMinute = number == 0 ? minute : firstMinute;
            EXPECT_EQ(minute, (firstMinute + number * row.interval / 60) % 60);
            EXPECT_EQ(readout["readout"], ++number);
        }
    }
    host_.Add("sim");
    Fail("readout --integration-time 60", ExitCode::BadData, "Integration time too high");
    EXPECT_THAT(tool_.Err(), HasSubstr("mode 2: 0.00442 s to 2.22819 s"));
}

/// A failure and Ctrl-C alike; before the first readout there is nothing to keep. What was there is replaced
/// by what is complete alone.
TEST_P(InstrumentCommandsTest, ReadoutsThatWereTakenAreKept) {
    // Interrupted after so many microseconds, a second of them before the first readout.
    constexpr std::uint64_t never = 90'000'000;
    for (const auto& [repeat, faults, interruptedAt, code, text, lines] : std::vector<
             std::tuple<const char*, const char*, std::uint64_t, ExitCode, const char*, std::ptrdiff_t>>{
             {"2", "", never, ExitCode::Success, "2 readouts in 1.", 3},
             {"5", "bulk-in 2:stall", never, ExitCode::InputOutput, "; 2 readouts were written", 3},
             {"5", "", 2'500'000, ExitCode::Interrupted, "interrupted; 2 readouts were written", 3},
             {"0", "", 1'500'000, ExitCode::Success, "1 readout in ", 2},
             {"0", "", 500'000, ExitCode::Success, "interrupted; nothing was recorded", 0},
             {"5", "bulk-in 0:stall", never, ExitCode::InputOutput, "; nothing was recorded", 0},
         }) {
        SCOPED_TRACE(text);
        host_.Add("sim", Leisurely);
        SetFaults(faults);
        WriteFile(folder_.Path("csv"), {1});
        After(interruptedAt, [this] { tool_.interruption.Request(); });
        Fail(std::string("readout --csv --repeat ") + repeat + " --interval 1 --output @csv", code, text);
        ForgetEvents();
        const bool isReplaced = code == ExitCode::Success && lines > 0;
        const std::string kept = folder_.Path(isReplaced ? "csv" : "csv.part");
        const std::string told = " to " + kept + ", and " + folder_.Path("csv") + " is as it was";
        EXPECT_EQ(tool_.Err().find(told) != std::string::npos, !isReplaced && lines > 0);
        const auto content = lines > 0 ? ReadFile(kept) : std::vector<std::uint8_t>();
        EXPECT_EQ(std::count(content.begin(), content.end(), '\n'), lines);
        EXPECT_EQ(std::filesystem::remove(kept), lines > 0);
        EXPECT_EQ(folder_.Files().size(), isReplaced ? 0u : 1u);
        EXPECT_TRUE(isReplaced || ReadFile(folder_.Path("csv")) == std::vector<std::uint8_t>{1});
    }
}

TEST_P(InstrumentCommandsTest, PlotsUseWhatTheTerminalHas) {
    host_.Add("sim", Leisurely);
    const auto isBraille = [this](const char* line) {
        Succeed(line);
        EXPECT_NE(tool_.Out().find('*') != std::string::npos,
                  tool_.Out().find("\xE2\xA0") != std::string::npos);
        return tool_.Out().find('*') == std::string::npos;
    };
    EXPECT_FALSE(isBraille("readout --plot"));
    tool_.outFacts.showsUtf8 = true;
    EXPECT_TRUE(isBraille("readout --plot"));
    EXPECT_FALSE(isBraille("readout --plot --ascii"));

    tool_.outFacts.isTerminal = true;
    Succeed("readout --plot --ascii --repeat 3");
    EXPECT_EQ(tool_.Out().find('\x1b'), std::string::npos) << "a terminal that cannot be drawn on";
    tool_.outFacts.movesCursor = true;
    tool_.outFacts.size = [] { return Cli::TerminalSize{40, 10}; };
    Succeed("readout --plot --ascii --repeat 3");
    const std::size_t lines = tool_.Lines().size() / 3;
    EXPECT_LT(lines, 10u);
    const std::string over = "\r\x1b[" + std::to_string(lines) + "A\x1b[J";
    EXPECT_EQ(std::ranges::count_if(tool_.Lines(), [&](const auto& line) { return line.starts_with(over); }),
              2);
}

TEST_P(InstrumentCommandsTest, OutputThatCannotBeWrittenEndsACommandAtOnce) {
    auto& instrument = host_.Add("sim", {.scanBytes = 100'000'000, .bytesPerSecond = 100'000});
    tool_.CloseOut();
    for (const char* command : {"readout --csv --repeat 60 --interval 1", "monitor --for 60", "scan"}) {
        const Stopwatch watch(clock_);
        After(500'000, [&] { instrument.PressButton(); });
        Fail(command, ExitCode::File, "the output cannot be written");
        watch.ExpectAtMost(5000);
        ForgetEvents();
    }
}

TEST_P(InstrumentCommandsTest, IdentifyAndReset) {
    auto& instrument = host_.Add("sim", {.firmware = 305});
    EXPECT_EQ(JsonOf("identify --json"), (nlohmann::json{{"identifier", Identifier()},
                                                         {"name", "sim"},
                                                         {"chipId", "5a0123456789abcd"},
                                                         {"misc", {0x21, 305, 0x43, 0x0506, 0x0708}},
                                                         {"mode", {3, 1, 0, 130, 68, 1}},
                                                         {"cpld", 0},
                                                         {"parameters", {294, 0, 1, 0, 0x55}}}));
    Succeed("identify", "5a0123456789abcd");
    Succeed("reset --code 017");
    instrument.WithCommands([](const Simulator::Commands& commands) {
        EXPECT_EQ(commands.lastResetCode, 17) << "a leading zero means nothing";
        EXPECT_EQ(commands.resets, 4u) << "each opening resets it as well";
    });
    Fail("reset --code 256", ExitCode::Usage);
}

TEST_P(InstrumentCommandsTest, MonitorReportsButtonAndRemovalAndEndsInTime) {
    auto& instrument = host_.Add("sim");
    const Stopwatch watch(clock_);
    Succeed("monitor --for 3");
    watch.ExpectBetween(3000, 3100);
    EXPECT_EQ(tool_.Out(), "");
    After(1'000'000, [this] { tool_.interruption.Request(); });
    Succeed("monitor");
    EXPECT_EQ(tool_.Out(), "") << "an end that the user wants is no removal";
    After(1'000'000, [&] { instrument.PressButton(); });
    After(2'000'000, [&] { host_.Bus().Unplug("sim"); });
    Succeed("monitor --json");
    ASSERT_EQ(tool_.Lines().size(), 2u) << tool_.Out();
    const auto button = nlohmann::json::parse(tool_.Lines()[0]);
    EXPECT_EQ(button["event"], "button");
    EXPECT_NEAR(button["seconds"], 1.0, clock_.IsVirtual() ? 0.05 : 0.5);
    EXPECT_EQ(nlohmann::json::parse(tool_.Lines()[1])["event"], "removed");
}

TEST_P(InstrumentCommandsTest, InstrumentsAreNamedByTheEndOfTheirIdentifier) {
    host_.Add("left");
    host_.Add("right");
    Fail("identify --device up", ExitCode::NoInstrument, Identifier("right"));
    Fail("identify --device t", ExitCode::NoInstrument, "name one of them: " + Identifier("left") + ", ");
    EXPECT_EQ(JsonOf("identify --json")["name"], "left");
    EXPECT_THAT(tool_.Err(), HasSubstr("taking " + Identifier("left")));
    for (const std::string& line : std::vector<std::string>{
             "identify --device ight --json",
             "-d right identify --json",
             std::string("--device=right identify --json --transport ") + Name(GetParam()),
             "-d right identify --json -d right",
             "ram -d right show --json",
         }) {
        Succeed(line);
        EXPECT_EQ(tool_.Json()["identifier"], Identifier("right"));
        EXPECT_EQ(tool_.Err(), "");
    }
    for (const auto& [line, text] : std::vector<std::pair<const char*, const char*>>{
             {"-d left identify -d right", "--device is given twice: left and right"},
             {"-d left list", "--device means nothing to `ostra list`"},
             {"list -d left", "--device means nothing to `ostra list`"},
             {"-d left eeprom check image", "--device excludes --image"},
             {"--transport serial list", "serial"},
             {"identify -d chip:5a", "16 hexadecimal digits"},
         }) {
        Fail(line, ExitCode::Usage, text);
    }
}

TEST_P(InstrumentCommandsTest, ChipsTellInstrumentsApart) {
    host_.Add("left");
    host_.Add("right", {.chipId = {1, 2, 3, 4, 5, 6, 7, 8}});
    Succeed("list --chip-id");
    EXPECT_THAT(tool_.Lines()[2], testing::AllOf(HasSubstr("right"), HasSubstr("0102030405060708")));
    EXPECT_EQ(JsonOf("identify --device chip:5A0123456789ABCD --json")["name"], "left");

    Platform::ErrorCode error = Platform::Errors::Success;
    auto other = host_.Bus().Open("left", error);
    ASSERT_EQ(other->Claim(), Platform::Errors::Success);
    const auto instruments = JsonOf("list --chip-id --json")["instruments"];
    EXPECT_EQ(instruments[0]["chipId"], nullptr);
    EXPECT_THAT(instruments[0]["problem"].get<std::string>(), HasSubstr("used by another process"));
    EXPECT_EQ(instruments[1]["chipId"], "0102030405060708");
    EXPECT_EQ(JsonOf("identify -d chip:0102030405060708 --json")["name"], "right");
    Fail("identify -d chip:5a0123456789abcd", ExitCode::NotAvailable,
         Identifier("left") + ": the instrument is used");
    other.reset();
    Fail("identify -d chip:5a0123456789abce", ExitCode::NoInstrument, "chip:5a0123456789abce");
    host_.Bus().SetFaults("left", Simulator::FaultPlan::Parse("control 0+:stall"));
    Fail("list --chip-id --json", ExitCode::InputOutput, Identifier("left"));
    EXPECT_EQ(tool_.Json()["instruments"].size(), 2u);
}

TEST_P(InstrumentCommandsTest, VerboseTellsWhatIsSent) {
    host_.Add("sim");
    // The interrupt pipe waits for the button meanwhile.
    const auto told = [this] {
        return std::regex_replace(tool_.Log(), std::regex("ostra: interrupt [^\n]*\n"), "");
    };
    Succeed("readout --json --verbose");
    EXPECT_EQ(told(),
              std::string("ostra: Reset code=31\n"
                          "ostra: SetMeasureParameters p1=294 p2=0 p3=1 p4=6\n"
                          "ostra: GetMISC m1=33 m2=301 m3=67 m4=1286 m5=1800\n"
                          "ostra: GetMeasureMode m1=3 m2=1 m3=0 m4=130 m5=68 m6=1\n"
                          "ostra: Measure\n"
                          "ostra: bulk in 256 of 256\n") +
                  (GetParam() == Transport::Native ? "ostra: ButtonReport\n" : ""));  // of the closing
    SetFaults("bulk-in 0:stall");
    Fail("-v readout", ExitCode::InputOutput, Identifier() + ": ");
    EXPECT_THAT(told(), HasSubstr("\nostra: bulk in 0 of 256: failed with code 0x"));
    SetFaults("control 1:stall");
    Fail("-v readout", ExitCode::InputOutput, Identifier() + ": ");
    EXPECT_THAT(told(), HasSubstr("SetMeasureParameters p1=294 p2=0 p3=1 p4=6: failed with code 0x"));
    SetFaults("bulk-in 0:short=60");
    Fail("readout", ExitCode::InputOutput, "60 of 256 bytes came");
    SetFaults("control 1+:short=3");
    Fail("identify", ExitCode::InputOutput, "3 of 8 bytes came");
}

TEST(CommandLineTest, UsageErrorsGoToStandardError) {
    ToolRunner tool;
    std::vector<std::pair<std::string, const char*>> wrong{
        {"", ""},
        {"no-such-command", "`ostra` has no command 'no-such-command'"},
        {"eeprom", "`ostra eeprom --help`"},
        {"eeprom --no-such-option no-such-command", "`ostra eeprom` has no command 'no-such-command'"},
        {"help eeprom chekc", "`ostra eeprom` has no command 'chekc'"},
        {"readout one two", "one two"},
    };
    std::istringstream others(
        "eeprom check ''; eeprom restore image --no-backup; identify --device ''; write-image;"
        "list --transport serial; list --capture ''; monitor --for 0; readout --no-such-option;"
        "readout --repeat -1; readout --interval nan; readout --integration-time 0;"
        "readout --integration-time nan; readout --parameters 1,2,3; readout --parameters 1,2,3,256;"
        "readout --parameters 1,2,3,4 --integration-time 1; scan --records 0; scan --total 0;"
        "scan --record-size 6554; scan --record-size 0; scan --record-size 7; scan --discard;"
        "scan --total 256 --records 1; scan --json; scan --json --output -; scan --raw --header;"
        "scan --raw --number; scan --raw --time");
    for (std::string line; std::getline(others, line, ';');) {
        wrong.emplace_back(line, "");
    }
    for (const auto& [line, text] : wrong) {
        EXPECT_EQ(tool.Run(line), ExitCode::Usage) << line;
        EXPECT_EQ(tool.Out(), "");
        EXPECT_NE(tool.Err(), "");
        EXPECT_THAT(tool.Err(), HasSubstr(text));
    }
    EXPECT_EQ(tool.Run("--help"), ExitCode::Success);
    EXPECT_THAT(tool.Out(), HasSubstr("Exit codes:"));
    for (const std::string command : {"", "readout", "eeprom check"}) {
        tool.Run(command + " --help");
        const std::string help = tool.Out();
        EXPECT_EQ(tool.Run("help " + command), ExitCode::Success);
        EXPECT_EQ(tool.Out(), help);
    }
    EXPECT_EQ(tool.Run("--version"), ExitCode::Success);
    EXPECT_THAT(tool.Out(), testing::MatchesRegex("ostra [0-9.]+\n"));
}

}  // namespace
}  // namespace Varnholt::Tests
