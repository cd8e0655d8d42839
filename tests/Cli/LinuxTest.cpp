#include <array>
#include <cstdio>

#include "Linux/Diagnosis.h"
#include "Linux/UdevRule.h"
#include "Platform/Usb/SimulatorAddress.h"
#include "Terminal.h"
#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using Cli::ExitCode;
using Cli::Finding;
using Level = Cli::Finding::Level;
using testing::HasSubstr;

Cli::DeviceFacts Plugged(const char* kernelDriver = "", bool isRegistered = true) {
    Cli::DeviceFacts facts;
    facts.info = {.name = "usb-1p2",
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

const Cli::Answer Answers{301, std::nullopt};
const Cli::Answer Silence{0, Cli::FailureReport{ExitCode::Timeout, "no answer in time", ""}};

/// What is seen, what opening it gives, and the findings that tell it.
struct Diagnosis {
    const char* name;
    Cli::MachineFacts facts;
    std::vector<Level> levels;
    const char* text;  ///< is in the last finding
    const char* fix;   ///< is in its fix; empty: there is none
    ExitCode code;
    int opened = 0;  ///< instruments that are tried
    Cli::Answer answer = Answers;
};

Diagnosis Usable(const char* name, const Cli::MachineFacts& facts, const std::vector<Level>& levels) {
    return {name, facts, levels, "answers (firmware 301)", "", ExitCode::Success, 1};
}

/// A device that its group may use, and the user who may not.
Cli::MachineFacts OfGroup(const char* group, const Cli::GroupFacts& user) {
    auto device = Plugged();
    device.isAccessible = false;
    device.group = group;
    return {.devices = {device}, .group = user};
}

std::vector<Diagnosis> Diagnoses() {
    auto locked = Plugged();
    locked.isAccessible = false;
    locked.holders = {{42, "python3"}};
    auto held = Plugged();
    held.holders = {{42, "python3"}};
    auto other = Plugged();
    other.hasEndpoints = false;
    const Platform::Usb::SimulatorInfo simulator{"simulated-1", 1000, 9, true, ""};
    auto simulatorInUse = simulator;
    simulatorInUse.usedBy = "ostra (process 8)";
    auto simulatorInKernel = simulator;
    simulatorInKernel.usedBy = Platform::Usb::KernelAsUser;
    auto simulatorOfAnother = simulator;
    simulatorOfAnother.usable = false;
    auto simulatorStopped = simulator;
    simulatorStopped.answers = false;
    const Cli::FailureReport noLock{ExitCode::NotAvailable, "no lock there", "make room"};
    const std::vector problem{Level::Problem};
    const std::vector good{Level::Good};
    return {
        {"nothing", {}, problem, "no USB device", "plug the instrument in", ExitCode::NoInstrument},
        {"not registered",
         {{Plugged("", false)}, {}},
         problem,
         "usb-1p2 (1209:0001, Meter)",
         "sudo ostra register 1209:0001",
         ExitCode::NoInstrument},
        {"registered by mistake",
         {{other}, {}},
         problem,
         "does not have the instrument's endpoints",
         "register --remove 1209:0001",
         ExitCode::NoInstrument},
        {"no permission",
         {{locked}, {}},
         problem,
         "no permission on /dev/bus/usb/001/007",
         "log in at this machine's own seat",
         ExitCode::NotAvailable},
        {"no permission, no member", OfGroup("plugdev", {"ann"}), problem,
         "members of the group plugdev may use it, and ann is none",
         "group plugdev: sudo usermod -aG plugdev ann, then log in again", ExitCode::NotAvailable},
        {"no permission, not yet a member", OfGroup("plugdev", {"ann", true, true}), problem,
         "ann is one only from the next login on", "group plugdev: log in again", ExitCode::NotAvailable},
        {"no permission, an older version's rule", OfGroup("root", {"ann", true, true, true}), problem,
         "no permission on /dev/bus/usb/001/007", "group plugdev: sudo ostra register 1209:0001",
         ExitCode::NotAvailable},
        {"no permission, no such group", OfGroup("", {"ann", false}), problem,
         "no permission on /dev/bus/usb/001/007",
         "sudo groupadd --system plugdev; sudo ostra register 1209:0001; sudo usermod -aG plugdev ann",
         ExitCode::NotAvailable},
        {"no permission for a member", OfGroup("plugdev", {"ann", true, true, true}), problem,
         "no permission on /dev/bus/usb/001/007", "unplug it and plug it in again", ExitCode::NotAvailable},
        {"no USB",
         {.hasUsb = false},
         problem,
         "this machine has no USB",
         "usbipd attach",
         ExitCode::NoInstrument},
        {"no USB, simulated",
         {.simulators = {simulator}, .hasUsb = false},
         {Level::Good, Level::Note},
         "this machine has no USB",
         "/dev/bus/usb",
         ExitCode::Success,
         1},
        {"no lock",
         {.devices = {Plugged()}, .missingLock = noLock},
         {Level::Good, Level::Problem},
         "no lock there",
         "make room",
         ExitCode::NotAvailable,
         1},
        {"no lock where none is needed",
         {.devices = {Plugged()}, .missingLock = noLock, .needsLock = false},
         {Level::Good, Level::Note},
         "no lock there; the transport native needs it",
         "make room",
         ExitCode::Success,
         1},
        {"held",
         {{held}, {}},
         problem,
         "is in use by python3 (process 42)",
         "end that program",
         ExitCode::NotAvailable},
        {"silent",
         {{Plugged()}, {}},
         problem,
         "does not answer: no answer in time",
         "its firmware does not run",
         ExitCode::Timeout,
         1,
         Silence},
        {"simulated, in use",
         {{}, {simulatorInUse}},
         problem,
         "is in use by ostra (process 8)",
         "end that program",
         ExitCode::NotAvailable},
        {"simulated, stopped",
         {{}, {simulatorStopped}},
         problem,
         "simulated-1 does not answer",
         "kill -CONT 9",
         ExitCode::Timeout},
        {"simulated, another user's",
         {{}, {simulatorOfAnother}},
         {Level::Note, Level::Problem},
         "no USB device",
         "ostra-simulator",
         ExitCode::NoInstrument},
        {"simulated, plugged into the kernel",
         {{Plugged()}, {simulatorInKernel}},
         {Level::Good, Level::Note},
         "is plugged into the kernel",
         "",
         ExitCode::Success,
         1},
        Usable("good", {{Plugged()}, {}}, good),
        Usable("a kernel driver", {{Plugged("cdc_acm")}, {}}, {Level::Note, Level::Good}),
        Usable("a program drives it", {{Plugged("usbfs")}, {}}, good),
        Usable("simulated", {{}, {simulator}}, good),
        Usable("one held, one good", {{held, Plugged()}, {}}, {Level::Problem, Level::Good}),
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
        ASSERT_EQ(levels, row.levels);
        EXPECT_EQ(opened, row.opened) << "opening resets an instrument";
        const Finding& last = findings.back();
        EXPECT_THAT(last.subject + " " + last.text, HasSubstr(row.text));
        EXPECT_THAT(last.fix, HasSubstr(row.fix));
        EXPECT_EQ(last.fix.empty(), *row.fix == '\0') << last.fix;
        EXPECT_EQ(last.code, row.code);
    }
}

TEST(DoctorTest, TellsOfWhatCannotBeUsed) {
    const auto answers = [](const std::string&) { return Answers; };
    EXPECT_THAT(Cli::Judge({{Plugged("cdc_acm")}, {}}, answers).front().text,
                HasSubstr("the kernel driver cdc_acm holds its interface"));
    const auto simulator = Cli::Judge({{}, {{"simulated-1", 1000, 9, false, ""}}}, answers).front();
    EXPECT_THAT(simulator.text, HasSubstr("another user (user 1000, process 9)"));
    EXPECT_EQ(simulator.code, ExitCode::Success) << "somebody else's simulator is no failure";
}

TEST(FileNames, AreQuotedAsTheShellReadsThem) {
    for (const char* name : {"image.bin", "-b", "two words", "a'b\"c", "$(false)`false`!*", "Ü"}) {
        const std::string command = "printf %s " + Cli::QuotedFileName(name);
        FILE* const shell = popen(command.c_str(), "r");
        std::array<char, 64> read{};
        EXPECT_NE(std::fgets(read.data(), read.size(), shell), nullptr);
        pclose(shell);
        EXPECT_EQ(read.data(), (*name == '-' ? "./" : "") + std::string(name));
    }
}

class RegisterTest : public testing::Test {
  protected:
    ExitCode Register(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), "register");
        arguments.insert(arguments.end(), {"--file", file_});
        return tool_.Run(arguments);
    }
    std::string Rules() {
        const auto bytes = ReadFile(file_);
        return {bytes.begin(), bytes.end()};
    }

    ToolRunner tool_;
    TestFolder folder_;
    const std::string file_ = folder_.Path("rules.d/70-ostra.rules");
};

TEST_F(RegisterTest, WritesARuleForEachKindOnce) {
    ASSERT_EQ(Register({"1209:00AB"}), ExitCode::Success) << tool_.Err();
    ASSERT_EQ(Register({"04b4:1003"}), ExitCode::Success) << tool_.Err();
    ASSERT_EQ(Register({"1209:00ab"}), ExitCode::Success) << tool_.Err();
    const auto rule = [](const std::string& vendor, const std::string& product) {
        return "SUBSYSTEM==\"usb\", ENV{DEVTYPE}==\"usb_device\", ATTR{idVendor}==\"" + vendor +
               "\", ATTR{idProduct}==\"" + product +
               "\", ENV{OSTRA_INTERFACE_CLASS}=\"1\", TAG+=\"uaccess\", MODE=\"0660\", GROUP=\"plugdev\"\n";
    };
    const std::string rules = Rules();
    EXPECT_EQ(rules.substr(rules.find("SUBSYSTEM")), rule("1209", "00ab") + rule("04b4", "1003"));
}

TEST_F(RegisterTest, LeavesOtherRulesAlone) {
    ASSERT_EQ(Register({"1209:0001"}), ExitCode::Success);
    std::string rules = Rules();
    rules.insert(rules.size() - 1, ", SYMLINK+=\"meter\"");
    const std::string others =
        "# mine\nSUBSYSTEM==\"tty\", MODE=\"0666\"\n # " + rules.substr(rules.find("SUBSYSTEM"));
    const auto both = rules + others;
    WriteFile(file_, {both.begin(), both.end()});
    EXPECT_EQ(Register({"1209:0001"}), ExitCode::Success);
    EXPECT_EQ(Rules(), both);
    EXPECT_EQ(Register({"1209:0001", "--remove"}), ExitCode::Success);
    EXPECT_EQ(Rules(), rules.substr(0, rules.find("SUBSYSTEM")) + others);
    EXPECT_EQ(Register({"1209:0001", "--remove"}), ExitCode::NoInstrument) << "a comment is no rule";
}

TEST_F(RegisterTest, KnowsTheRulesOfOlderVersions) {
    const std::string header =
        "# Written by `ostra register`: these USB devices are measuring instruments.\n"
        "# The library looks for the property; the tag gives the user at the seat access.\n";
    const auto rule = [](const char* product, const char* rest) {
        return "SUBSYSTEM==\"usb\", ENV{DEVTYPE}==\"usb_device\", ATTR{idVendor}==\"1209\", "
               "ATTR{idProduct}==\"" +
               std::string(product) + "\", ENV{OSTRA_INTERFACE_CLASS}=\"1\", TAG+=\"uaccess\"" + rest + "\n";
    };
    constexpr const char* asNow = ", MODE=\"0660\", GROUP=\"plugdev\"";
    const std::string two = header + rule("0001", "") + rule("0002", "");
    std::filesystem::create_directories(std::filesystem::path(file_).parent_path());
    WriteFile(file_, {two.begin(), two.end()});
    ASSERT_EQ(Register({"1209:0002"}), ExitCode::Success) << tool_.Err();
    const std::string updated = Rules();
    EXPECT_EQ(updated.substr(updated.find("SUBSYSTEM")), rule("0001", "") + rule("0002", asNow));
    EXPECT_NE(updated.find("the group its members"), std::string::npos) << updated;

    const std::string one = header + rule("0001", "");
    WriteFile(file_, {one.begin(), one.end()});
    EXPECT_EQ(Register({"1209:0001", "--remove"}), ExitCode::Success) << tool_.Err();
    EXPECT_FALSE(std::filesystem::exists(file_)) << Rules();
}

TEST_F(RegisterTest, TakesARegistrationBack) {
    ASSERT_EQ(Register({"1209:0001"}), ExitCode::Success);
    ASSERT_EQ(Register({"04b4:1003"}), ExitCode::Success);
    EXPECT_EQ(Register({"1209:0002", "--remove"}), ExitCode::NoInstrument);
    EXPECT_EQ(Register({"1209:0001", "--remove"}), ExitCode::Success);
    EXPECT_EQ(Rules().find("\"1209\""), std::string::npos) << Rules();
    EXPECT_NE(Rules().find("\"04b4\""), std::string::npos) << Rules();
    EXPECT_EQ(Register({"04b4:1003", "--remove"}), ExitCode::Success);
    EXPECT_FALSE(std::filesystem::exists(file_)) << "a rule file without rules is of no use";
}

TEST_F(RegisterTest, DryRunsAndMistakesChangeNothing) {
    EXPECT_EQ(Register({"1209:0001", "--dry-run"}), ExitCode::Success);
    EXPECT_NE(tool_.Out().find("ATTR{idProduct}==\"0001\""), std::string::npos) << tool_.Out();
    EXPECT_FALSE(std::filesystem::exists(file_));
    ASSERT_EQ(Register({"1209:0001"}), ExitCode::Success);
    const std::string before = Rules();
    EXPECT_EQ(Register({"1209:0001", "--remove", "--dry-run"}), ExitCode::Success);
    EXPECT_NE(tool_.Out().find("would remove"), std::string::npos) << tool_.Out();
    for (const char* id : {"1209", "1209:1", "1209-0001", "1209:000g", "1209:00011", "\"1209:0001", ""}) {
        EXPECT_EQ(Register({id}), ExitCode::Usage) << id;
    }
    EXPECT_EQ(Rules(), before);
}

}  // namespace
}  // namespace Varnholt::Tests
