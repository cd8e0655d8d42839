#include "Linux/Diagnosis.h"
#include "Linux/UdevRule.h"
#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using Cli::ExitCode;
using Cli::Finding;
using Level = Cli::Finding::Level;

Cli::DeviceFacts Plugged(const char* kernelDriver = "", bool isRegistered = true) {
    Cli::DeviceFacts facts;
    facts.info = {.name = "usb-1-2",
                  .deviceNode = "/dev/bus/usb/001/007",
                  .systemPath = {},
                  .vendorId = "1209",
                  .productId = "0001",
                  .manufacturer = {},
                  .product = "Meter",
                  .serial = {},
                  .kernelDriver = kernelDriver,
                  .registered = isRegistered};
    return facts;
}

/// What is seen, what opening it gives, and the finding that tells it.
struct Diagnosis {
    const char* name;
    Cli::MachineFacts facts;
    Cli::Answer answer;
    std::vector<Level> levels;
    const char* text;  ///< is in the last finding
    const char* fix;   ///< is in its fix; empty: there is none
    ExitCode code;
    int opened;  ///< instruments that are tried
};

std::vector<Diagnosis> Diagnoses() {
    const Cli::Answer fine{301, std::nullopt};
    auto locked = Plugged();
    locked.isAccessible = false;
    locked.holders = {{42, "python3"}};
    auto held = Plugged();
    held.holders = {{42, "python3"}};
    auto other = Plugged();
    other.hasEndpoints = false;
    const auto problem = std::vector{Level::Problem};
    return {
        {"nothing", {}, fine, problem, "no USB device", "plug the instrument in", ExitCode::NoInstrument, 0},
        {"good", {{Plugged()}, {}}, fine, {Level::Good}, "answers (firmware 301)", "", ExitCode::Success, 1},
        {"not registered",
         {{Plugged("", false)}, {}},
         fine,
         problem,
         "usb-1-2 (1209:0001, Meter)",
         "sudo ostra register 1209:0001",
         ExitCode::NoInstrument,
         0},
        {"registered by mistake",
         {{other}, {}},
         fine,
         problem,
         "does not have the instrument's endpoints",
         "register --remove 1209:0001",
         ExitCode::NoInstrument,
         0},
        {"no permission",
         {{locked}, {}},
         fine,
         problem,
         "no permission on /dev/bus/usb/001/007",
         "log in at this machine's own seat",
         ExitCode::NotAvailable,
         0},
        {"held",
         {{held}, {}},
         fine,
         problem,
         "is in use by python3 (process 42)",
         "end that program",
         ExitCode::NotAvailable,
         0},
        {"a kernel driver",
         {{Plugged("cdc_acm")}, {}},
         fine,
         {Level::Note, Level::Good},
         "answers",
         "",
         ExitCode::Success,
         1},
        {"a program drives it",
         {{Plugged("usbfs")}, {}},
         fine,
         {Level::Good},
         "answers",
         "",
         ExitCode::Success,
         1},
        {"silent",
         {{Plugged()}, {}},
         {0, Cli::FailureReport{ExitCode::Timeout, "no answer in time", ""}},
         problem,
         "does not answer: no answer in time",
         "its firmware does not run",
         ExitCode::Timeout,
         1},
        {"simulated",
         {{}, {{"simulated-1", 1000, 9, true, ""}}},
         fine,
         {Level::Good},
         "answers",
         "",
         ExitCode::Success,
         1},
        {"simulated, in use",
         {{}, {{"simulated-1", 1000, 9, true, "ostra (process 8)"}}},
         fine,
         problem,
         "is in use by ostra (process 8)",
         "end that program",
         ExitCode::NotAvailable,
         0},
        {"simulated, another user's",
         {{}, {{"simulated-1", 1000, 9, false, ""}}},
         fine,
         {Level::Note, Level::Problem},
         "no USB device",
         "ostra-simulator",
         ExitCode::NoInstrument,
         0},
        {"one held, one good",
         {{held, Plugged()}, {}},
         fine,
         {Level::Problem, Level::Good},
         "answers",
         "",
         ExitCode::Success,
         1},
    };
}

TEST(DoctorTest, NamesTheReasonAndTheFix) {
    for (const Diagnosis& row : Diagnoses()) {
        SCOPED_TRACE(row.name);
        int opened = 0;
        const auto findings = Cli::Judge(row.facts, [&](const std::string&) {
            ++opened;
            return row.answer;
        });
        std::vector<Level> levels;
        for (const Finding& finding : findings) {
            levels.push_back(finding.level);
        }
        EXPECT_EQ(levels, row.levels);
        EXPECT_EQ(opened, row.opened) << "opening resets an instrument";
        ASSERT_FALSE(findings.empty());
        const Finding& last = findings.back();
        EXPECT_NE((last.subject + " " + last.text).find(row.text), std::string::npos) << last.text;
        EXPECT_NE(last.fix.find(row.fix), std::string::npos) << last.fix;
        EXPECT_EQ(last.fix.empty(), *row.fix == '\0') << last.fix;
        EXPECT_EQ(last.code, row.code);
    }
}

TEST(DoctorTest, TellsOfWhatCannotBeUsed) {
    const auto fine = [](const std::string&) { return Cli::Answer{301, std::nullopt}; };
    const auto driver = Cli::Judge({{Plugged("cdc_acm")}, {}}, fine).front();
    EXPECT_NE(driver.text.find("the kernel driver cdc_acm holds its interface"), std::string::npos);
    const auto simulator = Cli::Judge({{}, {{"simulated-1", 1000, 9, false, ""}}}, fine).front();
    EXPECT_NE(simulator.text.find("another user (user 1000, process 9)"), std::string::npos);
    EXPECT_EQ(simulator.code, ExitCode::Success) << "somebody else's simulator is no failure";
}

class RegisterTest : public testing::Test {
  protected:
    ExitCode Register(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), "register");
        arguments.insert(arguments.end(), {"--file", file});
        return tool.Run(arguments);
    }
    std::string Rules() {
        const auto bytes = ReadFile(file);
        return {bytes.begin(), bytes.end()};
    }

    ToolRunner tool;
    TestFolder folder;
    const std::string file = folder.Path("rules.d/70-ostra.rules");
};

TEST_F(RegisterTest, WritesARuleForEachKindOnce) {
    ASSERT_EQ(Register({"1209:00AB"}), ExitCode::Success) << tool.Err();
    ASSERT_EQ(Register({"04b4:1003"}), ExitCode::Success) << tool.Err();
    ASSERT_EQ(Register({"1209:00ab"}), ExitCode::Success) << tool.Err();
    const auto rule = [](const std::string& vendor, const std::string& product) {
        return "SUBSYSTEM==\"usb\", ENV{DEVTYPE}==\"usb_device\", ATTR{idVendor}==\"" + vendor +
               "\", ATTR{idProduct}==\"" + product +
               "\", ENV{OSTRA_INTERFACE_CLASS}=\"1\", TAG+=\"uaccess\"\n";
    };
    const std::string rules = Rules();
    EXPECT_EQ(rules.substr(rules.find("SUBSYSTEM")), rule("04b4", "1003") + rule("1209", "00ab"));
}

TEST_F(RegisterTest, TakesARegistrationBack) {
    ASSERT_EQ(Register({"1209:0001"}), ExitCode::Success);
    ASSERT_EQ(Register({"04b4:1003"}), ExitCode::Success);
    EXPECT_EQ(Register({"1209:0002", "--remove"}), ExitCode::NoInstrument);
    EXPECT_EQ(Register({"1209:0001", "--remove"}), ExitCode::Success);
    EXPECT_EQ(Rules(), Cli::UdevRules({{"04b4", "1003"}}));
    EXPECT_EQ(Register({"04b4:1003", "--remove"}), ExitCode::Success);
    EXPECT_FALSE(std::filesystem::exists(file)) << "a rule file without rules is of no use";
}

TEST_F(RegisterTest, DryRunsAndMistakesChangeNothing) {
    EXPECT_EQ(Register({"1209:0001", "--dry-run"}), ExitCode::Success);
    EXPECT_NE(tool.Out().find("ATTR{idProduct}==\"0001\""), std::string::npos) << tool.Out();
    EXPECT_FALSE(std::filesystem::exists(file));
    ASSERT_EQ(Register({"1209:0001"}), ExitCode::Success);
    const std::string before = Rules();
    EXPECT_EQ(Register({"1209:0001", "--remove", "--dry-run"}), ExitCode::Success);
    EXPECT_NE(tool.Out().find("would remove"), std::string::npos) << tool.Out();
    for (const char* id : {"1209", "1209:1", "1209-0001", "1209:000g", "1209:00011", "\"1209:0001", ""}) {
        EXPECT_EQ(Register({id}), ExitCode::Usage) << id;
    }
    EXPECT_EQ(Rules(), before);
}

}  // namespace
}  // namespace Varnholt::Tests
