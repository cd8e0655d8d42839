#include "Interface/Readout.h"
#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using Cli::ExitCode;
using Simulator::InstrumentSettings;
using testing::HasSubstr;

InstrumentSettings Leisurely() {
    InstrumentSettings settings;
    settings.takesIntegrationTime = true;
    return settings;
}

class InstrumentCommandsTest : public ToolTest {};
OSTRA_ON_BOTH_TRANSPORTS(InstrumentCommandsTest);

TEST_P(InstrumentCommandsTest, List) {
    Fail({"list"}, ExitCode::NoInstrument, "no instrument is connected");
    EXPECT_EQ(tool_.Out(), "");
    Fail({"list", "--json"}, ExitCode::NoInstrument);
    EXPECT_EQ(tool_.Json()["instruments"].size(), 0u);

    host_.Add("sim-b");
    host_.Add("sim-a");
    Succeed({"list"});
    EXPECT_EQ(tool_.Out(),
              "NAME   IDENTIFIER\nsim-a  " + Identifier("sim-a") + "\nsim-b  " + Identifier("sim-b") + "\n");
    EXPECT_EQ(tool_.Err(), "");
    Succeed({"list", "--json"});
    EXPECT_EQ(tool_.Out(), std::string("{\"transport\":\"") + Name(GetParam()) +
                               "\",\"instruments\":[{\"identifier\":\"" + Identifier("sim-a") +
                               "\",\"name\":\"sim-a\"},{\"identifier\":\"" + Identifier("sim-b") +
                               "\",\"name\":\"sim-b\"}]}\n");
}

TEST_P(InstrumentCommandsTest, TheTransportCanBeChosenAndIsGivenBack) {
    host_.Add("sim");
    const Transport other = GetParam() == Transport::Native ? Transport::UsbIo : Transport::Native;
    Succeed({"identify", "--transport", Name(other), "--json"});
    EXPECT_EQ(tool_.Json()["identifier"], std::string(Name(other)) + "/sim");
    Succeed({"identify", "--json"});
    EXPECT_EQ(tool_.Json()["identifier"], Identifier());
}

/// All forms of one readout hold the same values.
TEST_P(InstrumentCommandsTest, ReadoutForms) {
    auto& instrument = host_.Add("sim", Leisurely());
    Succeed({"readout", "--raw", "--output", folder_.Path("raw")});
    EXPECT_EQ(ParametersOf(instrument), (Simulator::MeasureParameters{294, 0, 1, 6}));
    EXPECT_EQ(instrument.WithCommands([](const auto& commands) { return commands.resets; }), 1u);
    const auto bytes = ReadFile(folder_.Path("raw"));
    ASSERT_EQ(bytes.size(), 256u);
    host_.Add("sim");  // the same noise once more for each
    Succeed({"readout", "--json"});
    const std::vector<int> values = tool_.Json()["values"];
    const auto expected = Interface::ReadoutFromBytes(std::span<const std::uint8_t, 256>(bytes.data(), 256));
    EXPECT_TRUE(std::equal(values.begin(), values.end(), expected.begin()));

    host_.Add("sim");
    Succeed({"readout", "--csv"});
    std::string csv = "1,0.000";
    for (const int value : values) {
        csv += "," + std::to_string(value);
    }
    ASSERT_EQ(tool_.Lines().size(), 2u);
    EXPECT_TRUE(tool_.Lines()[0].starts_with("readout,seconds,0,1,2,"));
    EXPECT_TRUE(tool_.Lines()[0].ends_with(",127,time,p1,p2,p3,p4,integrationTime"));
    EXPECT_TRUE(tool_.Lines()[1].starts_with(csv + ",20"));
    EXPECT_TRUE(tool_.Lines()[1].ends_with(",294,0,1,6,0.019992"));

    host_.Add("sim");
    Succeed({"readout"});
    ASSERT_EQ(tool_.Lines().size(), 17u);
    std::istringstream printed(tool_.Out());
    for (std::size_t i = 0; i < values.size(); ++i) {
        if (std::string index; i % 8 == 0) {
            printed >> index;
            EXPECT_EQ(index, std::to_string(i) + ":");
        }
        int value = 0;
        printed >> value;
        EXPECT_EQ(value, values[i]) << i;
    }
}

/// What the numbers were taken with, and when.
TEST_P(InstrumentCommandsTest, ReadoutsSayWhatTheyWereTakenWith) {
    struct Case {
        std::uint16_t firmware;
        Arguments options;
        nlohmann::json parameters;
        double time;
    };
    InstrumentSettings settings;
    const std::uint16_t usual = settings.firmware;
    for (const Case& row : {
             Case{usual, {}, {294, 0, 1, 6}, 294 * 68e-6},
             Case{usual, {"--parameters", "7,1,2,3"}, {7, 1, 2, 3}, 7 * 68e-6},
             Case{usual, {"--integration-time", "0.005"}, {147, 0, 1, 6}, 147 * 34e-6},
             Case{usual, {}, {294, 0, 1, 6}, 294 * 68e-6},
             Case{300, {}, {294, 0, 1, 6}, 294 * 68e-6},
         }) {
        settings.firmware = row.firmware;
        host_.Add("sim", settings);
        Arguments arguments = row.options;
        arguments.insert(arguments.begin(), {"readout", "--json", "--repeat", "2", "--interval", "60"});
        Succeed(arguments);
        ASSERT_EQ(tool_.Lines().size(), 2u);
        for (const std::string& line : tool_.Lines()) {
            const auto readout = nlohmann::json::parse(line);
            EXPECT_EQ(readout["parameters"], row.parameters);
            EXPECT_NEAR(readout["integrationTime"], row.time, 1e-9);
            EXPECT_THAT(readout["time"].get<std::string>(),
                        testing::MatchesRegex("20..-..-..T..:..:..\\.......:.."));
        }
        const auto minute = [this](std::size_t line) {
            const std::string time = nlohmann::json::parse(tool_.Lines()[line])["time"];
            return std::stoi(time.substr(14, 2));
        };
        EXPECT_EQ((minute(0) + 1) % 60, minute(1));
    }
}

TEST_P(InstrumentCommandsTest, ReadoutPlotsInTheCharactersOfTheTerminal) {
    host_.Add("sim");
    Succeed({"readout", "--plot"});
    EXPECT_THAT(tool_.Out(), HasSubstr("*"));
    EXPECT_EQ(tool_.Out().find("\xE2\xA0"), std::string::npos);
    tool_.outFacts.showsUtf8 = true;
    Succeed({"readout", "--plot"});
    EXPECT_EQ(tool_.Out().find('*'), std::string::npos);
    EXPECT_THAT(tool_.Out(), HasSubstr("\xE2\xA0"));
    Succeed({"readout", "--plot", "--ascii"});
    EXPECT_EQ(tool_.Out().find("\xE2\xA0"), std::string::npos);
}

TEST_P(InstrumentCommandsTest, ReadoutRepeatsFromStartToStart) {
    host_.Add("sim", Leisurely());
    struct Case {
        const char* repeat;
        const char* interval;
    };
    std::vector<Case> cases{{"3", "2"}};
    if (clock_.IsVirtual()) {
        cases.push_back({"52", "86400"});  // longer than 32 bits count milliseconds
    }
    for (const Case& row : cases) {
        Succeed({"readout", "--json", "--repeat", row.repeat, "--interval", row.interval});
        const auto lines = tool_.Lines();
        ASSERT_EQ(lines.size(), std::stoul(row.repeat));
        for (std::size_t i = 0; i < lines.size(); ++i) {
            const auto line = nlohmann::json::parse(lines[i]);
            EXPECT_EQ(line["readout"], i + 1);
            EXPECT_NEAR(line["seconds"], std::stod(row.interval) * static_cast<double>(i),
                        clock_.IsVirtual() ? 0.01 : 0.5);
        }
    }
}

/// A failure and Ctrl-C alike; before the first readout there is nothing to keep. What was there is replaced
/// by what is complete alone.
TEST_P(InstrumentCommandsTest, ReadoutsThatWereTakenAreKept) {
    struct Case {
        const char* repeat;
        const char* faults;
        std::uint64_t interruptedAt;  ///< microseconds, a second of them before the first readout
        ExitCode code;
        const char* text;
        std::ptrdiff_t lines;
    };
    constexpr std::uint64_t never = 90'000'000;
    for (const bool existed : {false, true}) {
        for (const Case& row : {
                 Case{"2", "", never, ExitCode::Success, "2 readouts in 1.", 3},
                 Case{"5", "bulk-in 2:stall", never, ExitCode::InputOutput, "; 2 readouts were written", 3},
                 Case{"5", "", 2'500'000, ExitCode::Interrupted, "interrupted; 2 readouts were written", 3},
                 Case{"0", "", 1'500'000, ExitCode::Success, "1 readout in ", 2},
                 Case{"0", "", 500'000, ExitCode::Success, "interrupted; nothing was recorded", 0},
                 Case{"5", "bulk-in 0:stall", never, ExitCode::InputOutput, "; nothing was recorded", 0},
             }) {
            SCOPED_TRACE(row.text);
            host_.Add("sim", Leisurely());
            SetFaults(row.faults);
            if (existed) {
                WriteFile(folder_.Path("csv"), {1});
            }
            Service::Interruption interruption;
            tool_.interruption = &interruption;
            const auto event = After(row.interruptedAt, [&] { interruption.Request(); });
            Fail({"readout", "--csv", "--repeat", row.repeat, "--interval", "1", "--output",
                  folder_.Path("csv")},
                 row.code, row.text);
            Platform::ClockScheduler().Forget(event);
            const bool isComplete = row.code == ExitCode::Success && row.lines > 0;
            const std::string kept = folder_.Path(existed && !isComplete ? "csv.part" : "csv");
            const auto content = row.lines > 0 ? ReadFile(kept) : std::vector<std::uint8_t>();
            EXPECT_EQ(std::count(content.begin(), content.end(), '\n'), row.lines);
            EXPECT_EQ(std::filesystem::remove(kept), row.lines > 0);
            EXPECT_EQ(folder_.Files().size(), existed && !isComplete ? 1u : 0u);
            EXPECT_TRUE(!existed || isComplete ||
                        ReadFile(folder_.Path("csv")) == std::vector<std::uint8_t>{1});
        }
    }
}

TEST_P(InstrumentCommandsTest, ALivePlotFitsOnItsTerminalAndIsDrawnOver) {
    host_.Add("sim", Leisurely());
    tool_.outFacts.isTerminal = true;
    Succeed({"readout", "--plot", "--repeat", "3"});
    EXPECT_EQ(tool_.Out().find('\x1b'), std::string::npos) << "a terminal that cannot be drawn on";
    tool_.outFacts.movesCursor = true;
    for (const Cli::TerminalSize size :
         {Cli::TerminalSize{20, 24}, Cli::TerminalSize{40, 10}, Cli::TerminalSize{132, 50}}) {
        tool_.outFacts.size = [size] { return size; };
        Succeed({"readout", "--plot", "--repeat", "3"});
        int lines = 0;
        int drawnOver = 0;
        for (const std::string& line : tool_.Lines()) {
            if (line.starts_with("\r\x1b[")) {
                EXPECT_TRUE(line.starts_with("\r\x1b[" + std::to_string(lines) + "A\x1b[J"));
                ++drawnOver;
                lines = 0;
            } else {
                EXPECT_LT(line.size(), static_cast<std::size_t>(size.columns));
            }
            EXPECT_LT(++lines, size.rows);
        }
        EXPECT_EQ(drawnOver, 2);
    }
}

TEST_P(InstrumentCommandsTest, OutputThatCannotBeWrittenEndsACommandAtOnce) {
    InstrumentSettings settings;
    settings.scanBytes = 100'000'000;
    settings.bytesPerSecond = 100'000;
    auto& instrument = host_.Add("sim", settings);
    tool_.CloseOut();
    for (const Arguments& command :
         std::vector<Arguments>{{"readout", "--csv", "--repeat", "60", "--interval", "1"},
                                {"monitor", "--for", "60"},
                                {"scan"}}) {
        const Stopwatch watch(clock_);
        const auto event = After(500'000, [&] { instrument.PressButton(); });
        Fail(command, ExitCode::File, "the output cannot be written");
        watch.ExpectAtMost(5000);
        Platform::ClockScheduler().Forget(event);
        EXPECT_EQ(instrument.PendingTransfers(), 0u);
    }
}

TEST_P(InstrumentCommandsTest, ReadoutWithAnIntegrationTimeChoosesTheMode) {
    auto& instrument = host_.Add("sim");
    Succeed({"readout", "--integration-time", "0.5"});
    EXPECT_EQ(ModeOf(instrument), 1);
    EXPECT_EQ(ParametersOf(instrument), (Simulator::MeasureParameters{7353, 0, 1, 6}));  // of 68 us
    Succeed({"readout", "--integration-time", "0.005"});
    EXPECT_EQ(ModeOf(instrument), 2);
    EXPECT_EQ(ParametersOf(instrument).p1, 147);  // of 34 us
    Fail({"readout", "--integration-time", "60"}, ExitCode::BadData, "Integration time too high");
    EXPECT_THAT(tool_.Err(), HasSubstr("mode 2: 0.00442 s to 2.22819 s"));
    EXPECT_EQ(ModeOf(instrument), 2);
}

TEST_P(InstrumentCommandsTest, Identify) {
    InstrumentSettings settings;
    settings.firmware = 305;
    host_.Add("sim", settings);
    Succeed({"identify", "--json"});
    const auto found = tool_.Json();
    EXPECT_EQ(found["identifier"], Identifier());
    EXPECT_EQ(found["name"], "sim");
    EXPECT_EQ(found["chipId"], "5a0123456789abcd");
    EXPECT_EQ(found["misc"], (nlohmann::json{0x21, 305, 0x43, 0x0506, 0x0708}));
    EXPECT_EQ(found["mode"][0], 3);
    EXPECT_EQ(found["parameters"][4], 0x55);
    Succeed({"identify"});
    EXPECT_THAT(tool_.Out(), HasSubstr("5a0123456789abcd"));
}

TEST_P(InstrumentCommandsTest, ResetSendsItsCodeAfterTheOneOfTheOpening) {
    auto& instrument = host_.Add("sim");
    Succeed({"reset", "--code", "017"});
    instrument.WithCommands([](const Simulator::Commands& commands) {
        EXPECT_EQ(commands.lastResetCode, 17) << "a leading zero means nothing";
        EXPECT_EQ(commands.resets, 2u);
    });
    Fail({"reset", "--code", "256"}, ExitCode::Usage);
}

TEST_P(InstrumentCommandsTest, MonitorReportsButtonAndRemoval) {
    auto& instrument = host_.Add("sim");
    After(1'000'000, [&] { instrument.PressButton(); });
    After(2'000'000, [&] { host_.Bus().Unplug("sim"); });
    Succeed({"monitor", "--json"});
    ASSERT_EQ(tool_.Lines().size(), 2u) << tool_.Out();
    const auto button = nlohmann::json::parse(tool_.Lines()[0]);
    EXPECT_EQ(button["event"], "button");
    EXPECT_NEAR(button["seconds"], 1.0, clock_.IsVirtual() ? 0.05 : 0.5);
    EXPECT_EQ(nlohmann::json::parse(tool_.Lines()[1])["event"], "removed");
}

TEST_P(InstrumentCommandsTest, MonitorEndsInTimeAndWithCtrlC) {
    host_.Add("sim");
    const Stopwatch watch(clock_);
    Succeed({"monitor", "--for", "3"});
    watch.ExpectBetween(3000, 3100);
    EXPECT_EQ(tool_.Out(), "");
    Service::Interruption interruption;
    tool_.interruption = &interruption;
    After(1'000'000, [&] { interruption.Request(); });
    Succeed({"monitor"});
    EXPECT_EQ(tool_.Out(), "") << "an end that the user wants is no removal";
}

TEST_P(InstrumentCommandsTest, WriteImageWritesTheBytesAsTheyAre) {
    auto& instrument = host_.Add("sim");
    std::vector<std::uint8_t> image(8192);
    for (std::size_t i = 0; i < image.size(); ++i) {
        image[i] = static_cast<std::uint8_t>(i * 7 + i / 256);
    }
    WriteFile(folder_.Path("image"), image);
    Succeed({"write-image", folder_.Path("image")});
    EXPECT_EQ(instrument.Eeprom(), image);
    Fail({"write-image", folder_.Path("missing")}, ExitCode::File);
    EXPECT_EQ(instrument.Eeprom(), image);
}

TEST_P(InstrumentCommandsTest, InstrumentsAreNamedByTheEndOfTheirIdentifier) {
    host_.Add("left");
    host_.Add("right");
    Fail({"identify", "--device", "up"}, ExitCode::NoInstrument, Identifier("right"));
    Succeed({"identify", "--device", "ight", "--json"});
    EXPECT_EQ(tool_.Json()["name"], "right");
    EXPECT_EQ(tool_.Err(), "");
    Succeed({"identify", "--json"});
    EXPECT_EQ(tool_.Json()["name"], "left");
    EXPECT_THAT(tool_.Err(), HasSubstr("taking " + Identifier("left")));
    for (const Arguments& arguments : std::vector<Arguments>{
             {"-d", "right", "identify", "--json"},
             {"--device=right", "--transport", Name(GetParam()), "identify", "--json"},
             {"-d", "right", "identify", "--json", "-d", "right"},
             {"ram", "-d", "right", "show", "--json"},
         }) {
        Succeed(arguments);
        EXPECT_EQ(tool_.Json()["identifier"], Identifier("right"));
    }
    const std::pair<Arguments, const char*> refused[] = {
        {{"-d", "left", "identify", "-d", "right"}, "--device is given twice: left and right"},
        {{"-d", "left", "list"}, "--device means nothing to `ostra list`"},
        {{"list", "-d", "left"}, "--device means nothing to `ostra list`"},
        {{"-d", "left", "eeprom", "check", "image"}, "--device excludes --image"},
        {{"--transport", "serial", "list"}, "serial"},
    };
    for (const auto& [arguments, text] : refused) {
        Fail(arguments, ExitCode::Usage, text);
    }
}

TEST_P(InstrumentCommandsTest, ChipsTellInstrumentsApart) {
    InstrumentSettings settings;
    settings.chipId = {1, 2, 3, 4, 5, 6, 7, 8};
    auto& left = host_.Add("left");
    host_.Add("right", settings);
    Succeed({"list", "--chip-id"});
    EXPECT_THAT(tool_.Lines()[2], testing::AllOf(HasSubstr("right"), HasSubstr("0102030405060708")));
    Succeed({"identify", "--device", "chip:5A0123456789ABCD", "--json"});
    EXPECT_EQ(tool_.Json()["name"], "left");

    ASSERT_EQ(left.Claim(), Platform::Errors::Success);
    Succeed({"list", "--chip-id", "--json"});
    const auto instruments = tool_.Json()["instruments"];
    EXPECT_EQ(instruments[0]["chipId"], nullptr);
    EXPECT_THAT(instruments[0]["problem"].get<std::string>(), HasSubstr("used by another process"));
    EXPECT_EQ(instruments[1]["chipId"], "0102030405060708");
    Succeed({"identify", "-d", "chip:0102030405060708", "--json"});
    EXPECT_EQ(tool_.Json()["name"], "right");
    Fail({"identify", "-d", "chip:5a0123456789abcd"}, ExitCode::NotAvailable,
         Identifier("left") + ": the instrument is used");
    left.Release();

    Fail({"identify", "-d", "chip:5a0123456789abce"}, ExitCode::NoInstrument, "chip:5a0123456789abce");
    Fail({"identify", "-d", "chip:5a"}, ExitCode::Usage, "16 hexadecimal digits");
    host_.Bus().SetFaults("left", Simulator::FaultPlan::Parse("control 0+:stall"));
    Fail({"list", "--chip-id", "--json"}, ExitCode::InputOutput, Identifier("left"));
    EXPECT_EQ(tool_.Json()["instruments"].size(), 2u);
}

TEST_P(InstrumentCommandsTest, VerboseTellsWhatIsSent) {
    host_.Add("sim");
    const auto told = [this] {
        std::vector<std::string> lines;
        std::istringstream stream(tool_.Log());
        for (std::string line; std::getline(stream, line);) {
            if (!line.starts_with("ostra: interrupt ")) {  // is waiting for the button meanwhile
                lines.push_back(line);
            }
        }
        return lines;
    };
    Succeed({"readout", "--verbose"});
    std::vector<std::string> expected{"ostra: Reset code=31",
                                      "ostra: SetMeasureParameters p1=294 p2=0 p3=1 p4=6", "ostra: Measure",
                                      "ostra: bulk in 256 of 256"};
    if (GetParam() == Transport::Native) {
        expected.emplace_back("ostra: ButtonReport");  // of the closing
    }
    EXPECT_EQ(told(), expected);
    SetFaults("bulk-in 0:stall");
    Fail({"-v", "readout"}, ExitCode::InputOutput, Identifier() + ": ");
    EXPECT_THAT(told(),
                testing::Contains(testing::StartsWith("ostra: bulk in 0 of 256: failed with code 0x")));
}

TEST(CommandLineTest, UsageErrorsGoToStandardError) {
    ToolRunner tool;
    for (const Arguments& arguments : std::vector<Arguments>{
             {},
             {"no-such-command"},
             {"eeprom"},
             {"eeprom", "check", ""},
             {"identify", "--device", ""},
             {"readout", "--no-such-option"},
             {"readout", "--repeat", "-1"},
             {"readout", "--parameters", "1,2,3"},
             {"readout", "--parameters", "1,2,3,256"},
             {"readout", "--parameters", "1,2,3,4", "--integration-time", "1"},
             {"readout", "--integration-time", "0"},
             {"readout", "--integration-time", "nan"},
             {"readout", "--interval", "nan"},
             {"monitor", "--for", "0"},
             {"scan", "--records", "0"},
             {"scan", "--total", "0"},
             {"eeprom", "restore", "image", "--no-backup"},
             {"scan", "--record-size", "6554"},
             {"scan", "--record-size", "0"},
             {"scan", "--total", "256", "--records", "1"},
             {"scan", "--json"},
             {"list", "--transport", "serial"},
             {"write-image"},
         }) {
        EXPECT_EQ(tool.Run(arguments), ExitCode::Usage) << testing::PrintToString(arguments);
        EXPECT_EQ(tool.Out(), "");
        EXPECT_NE(tool.Err(), "");
    }
    const std::pair<Arguments, const char*> texts[] = {
        {{"no-such-command"}, "`ostra` has no command 'no-such-command'"},
        {{"eeprom", "--no-such-option", "no-such-command"},
         "`ostra eeprom` has no command 'no-such-command'"},
        {{"readout", "one", "two"}, "one two"},
        {{"eeprom"}, "`ostra eeprom --help`"},
    };
    for (const auto& [arguments, text] : texts) {
        tool.Run(arguments);
        EXPECT_THAT(tool.Err(), HasSubstr(text));
    }
    EXPECT_EQ(tool.Run({"--help"}), ExitCode::Success);
    EXPECT_THAT(tool.Out(), HasSubstr("Exit codes:"));
    for (const Arguments& command :
         std::vector<Arguments>{{}, {"readout"}, {"eeprom"}, {"eeprom", "check"}}) {
        Arguments arguments = command;
        arguments.push_back("--help");
        tool.Run(arguments);
        const std::string help = tool.Out();
        arguments = command;
        arguments.insert(arguments.begin(), "help");
        EXPECT_EQ(tool.Run(arguments), ExitCode::Success);
        EXPECT_EQ(tool.Out(), help);
    }
    EXPECT_EQ(tool.Run({"help", "eeprom", "chekc"}), ExitCode::Usage);
    EXPECT_THAT(tool.Err(), HasSubstr("`ostra eeprom` has no command 'chekc'"));
    EXPECT_EQ(tool.Run({"--version"}), ExitCode::Success);
    EXPECT_EQ(tool.Out(), "ostra 1.0.3\n");
}

#if !defined(_WIN32)
TEST(CommandLineTest, AWrongOneLeavesTheCaptureFileThatIsThere) {
    const TestFolder folder;
    const std::string file = folder.Path("capture");
    WriteFile(file, {1});
    ToolRunner tool;
    for (const Arguments& arguments : std::vector<Arguments>{
             {"readout", "--no-such-option"},
             {"write-image"},
             {"scan", "--record-size", "7"},
             {"calibration", "set", "1211"},
             {"readout", "--device", "nobody"},
         }) {
        std::vector<std::string> withCapture{"--capture", file};
        withCapture.insert(withCapture.end(), arguments.begin(), arguments.end());
        EXPECT_NE(tool.Run(withCapture), ExitCode::Success) << testing::PrintToString(arguments);
        EXPECT_EQ(ReadFile(file), std::vector<std::uint8_t>{1}) << testing::PrintToString(arguments);
    }
    EXPECT_EQ(tool.Run({"list", "--capture", ""}), ExitCode::Usage);
}
#endif

}  // namespace
}  // namespace Varnholt::Tests
