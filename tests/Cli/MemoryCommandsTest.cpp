#if !defined(_WIN32)
#include <sys/stat.h>
#include <unistd.h>
#endif

#include <regex>
#include <thread>

#include "Protocol/ByteOrder.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"
#include "Support/Bytes.h"
#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using Cli::ExitCode;
using Service::EepromImage;
using testing::HasSubstr;
using testing::Not;

EepromImage Calibrated(const char* value) {
    return Service::WithCalibration(Service::FreshImage(), {{1211, value}}).image;
}

class MemoryCommandsTest : public ToolTest {
  protected:
    MemoryCommandsTest() : instrument_(host_.Add("sim")) {
        EepromImage content = Calibrated("77");
        Service::SetRawWord(content, 10203, 0xCAFE);
        std::fill(content.begin() + 1064, content.begin() + 2048, std::uint8_t{0x5A});
        instrument_.SetEeprom(content);
        before_ = instrument_.Eeprom();
    }

    void ExpectUnchanged() { EXPECT_EQ(instrument_.Eeprom(), before_); }
    Simulator::SimulatedInstrument& instrument_;
    EepromImage before_;
    const std::string image_ = folder_.Path("image");
    const std::string backup_ = folder_.Path("backup");
};
OSTRA_ON_BOTH_TRANSPORTS(MemoryCommandsTest);

/// And the same command says the same of an image of the instrument.
TEST_P(MemoryCommandsTest, ReadingChangesNothing) {
    WriteFile(image_, before_);
    // The second names an image instead; not every command takes one.
    for (const auto& [command, image] : std::vector<std::pair<std::string, std::string>>{
             {"eeprom backup @backup", ""},
             {"eeprom diff @image", ""},
             {"eeprom show", ""},
             {"eeprom show --json", "@image"},
             {"eeprom check --json", "--image @image"},
             {"calibration show --json", "--image @image"},
             {"log show --json", "--image @image"},
             {"ram show", ""},
             {"binary get @block", ""},
             {"word get --json", "--image @image"},
         }) {
        SetFaults("bulk-out 0+:stall");  // not even the same bytes are written once more
        Succeed(command);
        ExpectUnchanged();
        if (!image.empty()) {
            auto ofInstrument = tool_.Json();
            ofInstrument["source"] = image_;
            EXPECT_EQ(JsonOf(command + " " + image), ofInstrument);
        }
    }
    EXPECT_EQ(ReadFile(backup_), before_);
    EXPECT_EQ(ReadFile(folder_.Path("block")), Service::BinaryBlockOf(before_));
}

TEST_P(MemoryCommandsTest, ShowTellsWhatIsInTheEeprom) {
    const auto shown = JsonOf("eeprom show --json");
    EXPECT_EQ(shown["source"], Identifier());
    EXPECT_EQ(shown["table"]["length"], 334);
    EXPECT_EQ(shown["table"]["entries"].size(), 55u);
    EXPECT_EQ(shown["calibration"]["1211"], 77);
    EXPECT_EQ(shown["calibration"]["1000"], (nlohmann::json{-1.0, -1.0}));
    EXPECT_EQ(shown["log"]["used"], "main copy");
    EXPECT_EQ(shown["log"]["values"]["10010"].size(), 128u);
    EXPECT_EQ(shown["words"]["10203"], 0xCAFE);
    EXPECT_EQ(shown["binary"].get<std::string>().substr(0, 4), "5a5a");
    Succeed("eeprom show", "0000CAFE");
    Succeed("log show", "all 128 elements are 0");
}

TEST_P(MemoryCommandsTest, CheckAnswersWithItsExitCode) {
    EepromImage damaged = before_;
    damaged[4096] = 7;
    instrument_.SetEeprom(damaged);
    Fail("eeprom check", ExitCode::BadData);
    EXPECT_THAT(tool_.Out(), HasSubstr("error"));
    Fail("eeprom check --json", ExitCode::BadData);
    EXPECT_EQ(tool_.Json()["sane"], false);
    for (const std::string command :
         {"eeprom show", "calibration show", "calibration set 1211=1", "log show", "log reset"}) {
        Fail(command, ExitCode::BadData, Identifier() + ": the driver cannot use");
        EXPECT_THAT(tool_.Err(), HasSubstr("`ostra eeprom check --device sim`"));
    }
    Succeed("eeprom backup @backup");  // whatever it holds
    EXPECT_EQ(ReadFile(backup_), damaged);
    Succeed("binary get @block");
}

TEST_P(MemoryCommandsTest, WriteMakesABackupThatRestores) {
    WriteFile(image_, Calibrated("5"));
    Succeed("eeprom write @image --backup @backup --json");
    EXPECT_EQ(instrument_.Eeprom(), Calibrated("5"));
    EXPECT_EQ(ReadFile(backup_), before_);
    EXPECT_EQ(tool_.Json()["backup"], backup_);
    EXPECT_THAT(tool_.Err(), HasSubstr("backup of " + Identifier() + " written to " + backup_));
    EXPECT_GT(tool_.Json()["pieces"], 0);
    Succeed("eeprom restore @backup");
    ExpectUnchanged();
    Succeed("eeprom restore @backup", "nothing to write");
    Fail("eeprom write @image --backup @backup", ExitCode::File);
    ExpectUnchanged();
    EXPECT_EQ(ReadFile(backup_), before_) << "a backup is never written over";
}

TEST_P(MemoryCommandsTest, BackupsGetANameOfTheirOwn) {
    const auto previous = std::filesystem::current_path();
    std::filesystem::current_path(folder_.Path(""));
    host_.Bus().Unplug("sim");
    auto& odd = host_.Add("09:@AZ[`az{-.");  // the neighbours of what stays
    for (const EepromImage& content : {before_, Calibrated("5")}) {
        odd.SetEeprom(content);
        const std::string name = JsonOf("calibration set 1211=6 1000=0.5,-2 --json")["backup"];
        const std::regex form("ostra-09__AZ__az_-\\.-5a0123456789abcd-\\d{8}-\\d{6}(-2)?\\.eeprom");
        EXPECT_TRUE(std::regex_match(name, form)) << name;
        EXPECT_EQ(ReadFile(folder_.Path(name)), content);
        EXPECT_EQ(odd.Eeprom(), Service::WithCalibration(content, {{1211, "6"}, {1000, "0.5,-2"}}).image);
    }
#if !defined(_WIN32)
    std::filesystem::create_directory("gone");
    std::filesystem::current_path("gone");
    std::filesystem::remove(folder_.Path("gone"));
    Fail("calibration set 1211=5", ExitCode::File, "current folder, and nothing was changed");
#endif
    std::filesystem::current_path(previous);
}

TEST_P(MemoryCommandsTest, DryRunsChangeNothingAndLeaveNoFile) {
    WriteFile(image_, Calibrated("5"));
    WriteFile(folder_.Path("block"), std::vector<std::uint8_t>(1904, 1));
    for (const std::string command :
         {"eeprom write @image", "eeprom restore @image", "calibration set 1211=5", "log reset",
          "binary put @block", "word put 10200=1", "ram set 2010=5"}) {
        const auto parameters = ParametersOf(instrument_);
        EXPECT_EQ(JsonOf(command + " --dry-run --json")["dryRun"], true);
        ExpectUnchanged();
        EXPECT_EQ(ParametersOf(instrument_), parameters);
    }
    EXPECT_EQ(folder_.Files(), (std::vector<std::string>{"block", "image"}));
}

TEST_P(MemoryCommandsTest, OnlySaneImagesAreWritten) {
    EepromImage erased(8192, 0xFF);
    WriteFile(image_, erased);
    Fail("eeprom write @image --no-backup", ExitCode::BadData);
    Fail("eeprom restore @image", ExitCode::BadData);
    ExpectUnchanged();
    Succeed("eeprom write @image --no-backup --force");
    EXPECT_EQ(instrument_.Eeprom(), erased);
    WriteFile(image_, std::vector<std::uint8_t>(8191));
    EXPECT_EQ(tool_.Run("eeprom write @image --force"), ExitCode::BadData) << "no force makes it an image";
    Fail("eeprom write @missing", ExitCode::File);
}

TEST_P(MemoryCommandsTest, FilesThatAreMadeReplaceOthersByForceOnly) {
    for (const auto& [command, content] : std::vector<std::tuple<std::string, EepromImage>>{
             {"eeprom backup", before_},
             {"eeprom new", Service::FreshImage()},
             {"binary get", Service::BinaryBlockOf(before_)},
         }) {
        WriteFile(image_, {1});
        Fail(command + " @image", ExitCode::File, "--force replaces it");
        EXPECT_EQ(ReadFile(image_), std::vector<std::uint8_t>{1});
        Succeed(command + " @image --force");
        EXPECT_EQ(ReadFile(image_), content);
        for (const char* form : {" - --json", " - --force"}) {
            Succeed(command + form);
            EXPECT_EQ(tool_.Out(), std::string(content.begin(), content.end())) << "and nothing else";
            EXPECT_NE(tool_.Err(), "");
        }
        tool_.outFacts.isTerminal = true;
        Fail(command + " -", ExitCode::Usage, "terminal");
        EXPECT_EQ(tool_.Out(), "");
        tool_.outFacts.isTerminal = false;
    }
}

#if !defined(_WIN32)
/// From now on standard input is a pipe that holds these bytes and ends.
void PipeIntoStandardInput(const std::vector<std::uint8_t>& content) {
    int ends[2];
    EXPECT_EQ(::pipe(ends), 0);
    EXPECT_EQ(::write(ends[1], content.data(), content.size()), static_cast<ssize_t>(content.size()));
    ::dup2(ends[0], STDIN_FILENO);
    ::close(ends[0]);
    ::close(ends[1]);
}

TEST_P(MemoryCommandsTest, ImagesComeFromStandardInputAndGoToStandardOutput) {
    const EepromImage wanted = Calibrated("5");
    WriteFile(image_, wanted);
    const auto bytes = [](const EepromImage& content) { return std::string(content.begin(), content.end()); };
    struct Case {
        const char* line;
        EepromImage input;
        ExitCode code = ExitCode::Success;
        const char* text = "";  ///< on standard error
        std::string out{};      ///< empty: whatever it is, it is no image
    };
    for (const Case& row : {
             Case{"calibration set 1211=5 --image -", Calibrated("77"), ExitCode::Success,
                  "byte of standard input changed", bytes(wanted)},
             Case{"calibration set 1211=5 --image -", wanted, ExitCode::Success, "", bytes(wanted)},
             Case{"log reset --image - --dry-run", wanted},
             Case{"eeprom check /dev/stdin", wanted},
             Case{"eeprom show - --json", wanted},
             Case{"eeprom check -", EepromImage(8192), ExitCode::BadData, "standard input has errors"},
             Case{"eeprom diff @image -", wanted},
             Case{"eeprom diff - -", wanted, ExitCode::Usage, "standard input"},
             Case{"calibration set 1211=5 --image /dev/stdin", wanted, ExitCode::Usage, "--image -"},
             Case{"eeprom write - --backup -", wanted, ExitCode::Success, "written to standard output",
                  bytes(before_)},
             Case{"write-image -", before_},
             Case{"eeprom restore -", EepromImage(8191), ExitCode::BadData, "it has 8191 bytes"},
             Case{"eeprom restore -", EepromImage(8193), ExitCode::BadData, "more than 8192 bytes"},
             Case{"binary put -", {}, ExitCode::BadData, "it has 0 bytes"},
             Case{"binary put /proc/self/mem", {}, ExitCode::File, "self/mem: Input/output error"},
         }) {
        PipeIntoStandardInput(row.input);
        SCOPED_TRACE(row.line);
        Fail(row.line, row.code, row.text);
        EXPECT_TRUE(row.out.empty() ? tool_.Out().size() != 8192 : tool_.Out() == row.out);
    }
    ExpectUnchanged();
}

TEST_P(MemoryCommandsTest, PipesAreNotWaitedForWithoutEnd) {
    const std::string pipe = folder_.Path("pipe");
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    tool_.inputPatience = 1;
    Fail("eeprom check @pipe", ExitCode::File, "nothing comes from " + pipe);
    tool_.inputPatience = std::numeric_limits<std::uint32_t>::max();
    const auto write = [&](const std::function<void(std::ofstream & file)>& action) {
        return std::thread([&pipe, action] {
            std::ofstream file(pipe, std::ios::binary);  // opened when the tool reads
            action(file);
        });
    };
    std::thread writer = write([this](std::ofstream& file) {
        // In two pieces.
        file.write(reinterpret_cast<const char*>(before_.data()), 5000).flush();
        file.write(reinterpret_cast<const char*>(before_.data()) + 5000, 3192);
    });
    Succeed("eeprom diff @pipe --device sim");
    writer.join();
    writer = write([this](std::ofstream&) { tool_.interruption.Request(); });
    Fail("eeprom write @pipe", ExitCode::Interrupted);
    writer.join();
    ExpectUnchanged();
}

#endif

TEST_P(MemoryCommandsTest, CtrlCEndsAWriteBetweenTwoPieces) {
    EepromImage wanted = before_;
    std::fill(wanted.begin() + 5000, wanted.end(), std::uint8_t{0x77});
    WriteFile(image_, wanted);
    // In the middle of the fifth piece.
    SetFaults("bulk-out 12:late=400");
    After(300'000, [this] { tool_.interruption.Request(); });
    Fail("eeprom write @image --backup @backup", ExitCode::Interrupted);
    EXPECT_THAT(tool_.Err(),
                testing::AllOf(HasSubstr("interrupted; 5 of 13 pieces"), HasSubstr("eeprom restore")));
    // 5000 lies in the piece from 4864 on.
    EepromImage expected = before_;
    std::fill(expected.begin() + 5000, expected.begin() + 4864 + 5 * 256, std::uint8_t{0x77});
    EXPECT_EQ(instrument_.Eeprom(), expected);
}

TEST_P(MemoryCommandsTest, ChangesOfAnImageFileNeedNoInstrument) {
    host_.Bus().Unplug("sim");
    WriteFile(image_, before_);
    const auto block = CountingImage(0, 1904);
    WriteFile(folder_.Path("block"), block);
    Succeed("calibration set 1211=5 --image @image");
    Succeed("word put 10200=7 10201=0xFFFF0000 --image @image");
    Succeed("binary put @block --image @image");
    Succeed("log reset --image @image");
    EepromImage expected = Calibrated("5");
    Service::SetRawWord(expected, 10200, 7);
    Service::SetRawWord(expected, 10201, 0xFFFF0000);
    Service::SetRawWord(expected, 10203, 0xCAFE);
    std::copy_n(block.begin(), 984, expected.begin() + 1064);
    std::copy_n(block.begin() + 984, 920, expected.begin() + 3112);
    EXPECT_EQ(ReadFile(image_), expected);
    EXPECT_EQ(folder_.Files(), (std::vector<std::string>{"block", "image"})) << "no backups of files";
    EXPECT_EQ(JsonOf("word get 10215 10216 --json --image @image")["words"],
              (nlohmann::json{{"10215", 0xFFFFFFFF}, {"10216", 0x0001014E}}));
    WriteFile(folder_.Path("block"), std::vector<std::uint8_t>(1903));
    for (const std::string refused : {"word put 10216=1", "word put 10200=0x100000000",
                                      "calibration set 1211=1,2", "word get --device sim"}) {
        Fail(refused + " --image @image", ExitCode::Usage);
    }
    Fail("binary put @block --image @image", ExitCode::BadData);
    EXPECT_EQ(ReadFile(image_), expected);
    EXPECT_EQ(tool_.Run("log reset --image ''"), ExitCode::Usage) << "does not mean an instrument";
}

TEST_P(MemoryCommandsTest, LogIsShownAndBothCopiesAreEmptied) {
    Service::ImageModel model(before_);
    std::vector<std::int32_t> ramp(128);
    std::iota(ramp.begin(), ramp.end(), 77'000);
    model.Get().SetProperty(10010, Service::Property(ramp));
    model.Get().SetProperty(10002, Service::Property(std::int32_t{5}));
    model.Get().DumpLog();
    EepromImage used = model.Contents();
    used[2048] ^= 1;  // the second copy is damaged
    instrument_.SetEeprom(used);
    EXPECT_EQ(JsonOf("log show --json")["values"]["10002"], 5);
    EXPECT_EQ(tool_.Json()["secondValid"], false);
    Succeed("log show");
    EXPECT_THAT(tool_.Out(), testing::AllOf(HasSubstr("*"), Not(HasSubstr("77001"))));
    Succeed("log show --numbers");
    EXPECT_THAT(tool_.Out(), testing::AllOf(Not(HasSubstr("*")), HasSubstr(" 77001")));
    Succeed("log reset --no-backup");
    EXPECT_EQ(instrument_.Eeprom(), before_);
}

TEST_P(MemoryCommandsTest, DiffNamesValuesAndAreas) {
    WriteFile(image_, before_);
    WriteFile(backup_, Service::WithCalibration(before_, {{1211, "78"}}).image);
    Fail("eeprom diff @image @backup", ExitCode::Different);
    EXPECT_THAT(tool_.Out(), HasSubstr("calibration  1211  77 -> 78"));
    Fail("eeprom diff @backup --json", ExitCode::Different);
    EXPECT_EQ(tool_.Json()["b"], Identifier());
    EXPECT_EQ(tool_.Json()["values"],
              nlohmann::json::parse(R"([{"kind":"calibration","id":1211,"a":78,"b":77}])"));
    EXPECT_EQ(tool_.Json()["areas"][0]["firstDifference"], 4711);
}

TEST_P(MemoryCommandsTest, SeveralInstrumentsMustBeToldApartBeforeOneIsChanged) {
    host_.Add("other");
    WriteFile(image_, Calibrated("5"));
    for (const std::string command :
         {"write-image @image", "eeprom write @image", "calibration set 1211=5"}) {
        Fail(command, ExitCode::Usage, "--device");
    }
    ExpectUnchanged();
}

class RamTest : public ToolTest {};
OSTRA_ON_BOTH_TRANSPORTS(RamTest);

TEST_P(RamTest, TimesFollowTheModeThatTheInstrumentIsIn) {
    auto& instrument = host_.Add("sim");
    EXPECT_NEAR(JsonOf("ram set 2009=0.005 2008=1 --json")["changes"][0]["after"], 0.004998, 1e-7)
        << "147 units of 34 us";
    EXPECT_EQ(ParametersOf(instrument).p4 & 1, 1);
    // A new run of the tool knows the mode's time unit, and leaves what it was not asked to change.
    Succeed("ram set 2010=200");
    EXPECT_EQ(ModeOf(instrument), 2);
    EXPECT_EQ(ParametersOf(instrument).p1, 147);
    EXPECT_EQ(ParametersOf(instrument).p3, 200);
    EXPECT_NEAR(JsonOf("ram show --json")["ram"]["2009"], 0.004998, 1e-7);
}

TEST_P(RamTest, TimesThatNoModeCountsAreExplained) {
    auto& instrument = host_.Add("sim");
    Succeed("ram set 2009=0.005 2001=0 9189=0");
    const std::string modes =
        "\n       mode 1: 0.00884 s to 4.45638 s; mode 2: 0.00442 s to 2.22819 s; mode 3: 0.001 s to 0.65535 "
        "s\n";
    for (const auto& [set, text] : std::vector<std::pair<std::string, std::string>>{
             {"2009=10", "Integration time too high: 10 s fits none of the instrument's modes" + modes},
             {"2009=0.0009",
              "Integration time too low: 0.0009 s fits none of the instrument's modes" + modes},
             {"2009=0.05 2001=600",
              "2001=600: the instrument cannot count that far\n       the longest is 579.329 s, in the "
              "measurement mode that 2009 asks for\n"},
         }) {
        Fail("ram set " + set, ExitCode::BadData);
        EXPECT_EQ(tool_.Err(), "ostra: " + text);
        EXPECT_EQ(ModeOf(instrument), 2) << "back in its mode";
    }
    auto& old = host_.Add("sim", {.firmware = Simulator::OldFirmware});
    Succeed("ram set 2009=0.068 2001=0.0884");
    Fail("ram set 2009=4.4565", ExitCode::BadData, "the longest is 4.45638 s\n");  // 16 bits
    EXPECT_EQ(ParametersOf(old).p1, 1000);
    EXPECT_EQ(ParametersOf(old).p2, 10);
}

TEST_P(RamTest, ShowNamesEachParameter) {
    host_.Add("sim");
    Succeed("ram show");
    EXPECT_EQ(tool_.Out(),
              "  ID  VALUE     MEANING\n"
              "2000  0         flag, bit 1\n"
              "2001  0         second time, seconds\n"
              "2002  0         flag, bit 2\n"
              "2003  0         flag, bit 3\n"
              "2008  0         flag, bit 0\n"
              "2009  0.019992  integration time, seconds\n"
              "2010  1         third parameter, at most 256\n"
              "2004  67        MISC m3\n"
              "2005  -1        not loaded\n"
              "2006  1286      MISC m4\n"
              "2012  33        MISC m1\n"
              "2013  301       MISC m2\n"
              "2020  1800      MISC m5\n"
              "2011  -1        not loaded\n"
              "2014  -1        not loaded\n"
              "2015  -1        not loaded\n"
              "2016  0.25      from MISC m2\n"
              "2017  0.005     from MISC m2\n"
              "9189  -1        in the place of 2010, with 2008\n"
              "2021  85        fifth parameter\n");
}

TEST_P(RamTest, RefusesWhatCannotBeSet) {
    auto& instrument = host_.Add("sim");
    for (const std::string id :
         {"2004", "2006", "2012", "2013", "2016", "2017", "2020", "2021", "2005", "1211"}) {
        Fail("ram set " + id + "=1", ExitCode::Usage);
        EXPECT_EQ(tool_.Err(),
                  "ostra: " + id +
                      " cannot be set\n       2000, 2001, 2002, 2003, 2008, 2009, 2010 and 9189 can\n");
    }
    for (const char* assignment : {"2009=-1", "2001=-0.1", "2010=-1"}) {
        Fail(std::string("ram set ") + assignment, ExitCode::BadData, "knows no negative numbers");
    }
    for (const auto& [id, most] :
         {std::pair(2000, 1), {2002, 1}, {2003, 1}, {2008, 1}, {2010, 256}, {9189, 65535}}) {
        const std::string known = std::to_string(id) + "=" + std::to_string(most);
        Succeed("ram set 2003=0 2008=1 " + known);
        const std::string assignment = std::to_string(id) + "=" + std::to_string(most + 1);
        Fail("ram set " + assignment, ExitCode::BadData);
        EXPECT_EQ(tool_.Err(),
                  "ostra: " + assignment + ": at most " + std::to_string(most) + " can be sent\n");
    }
    EXPECT_EQ(ParametersOf(instrument).p3, 65535);
}

TEST_P(RamTest, TellsWhatElseHasChanged) {
    host_.Add("sim");
    Fail("ram set 9189=1", ExitCode::Usage);  // it would have no effect
    EXPECT_EQ(tool_.Err(),
              "ostra: 9189 takes the place of 2010 only together with 2008=1\n       ostra ram set 9189=1 "
              "2008=1\n");
    EXPECT_EQ(JsonOf("ram set 9189=300 2008=1 --json")["changes"],
              nlohmann::json::parse(R"([{"id":9189,"before":-1,"after":300},
        {"id":2008,"before":0,"after":0},{"id":2010,"before":1,"after":300}])"));
}

}  // namespace
}  // namespace Varnholt::Tests
