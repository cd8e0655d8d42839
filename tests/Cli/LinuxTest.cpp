#include <array>
#include <cstdio>

#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using Cli::ExitCode;

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
    ExitCode Register(const std::string& line) {
        return tool_.Run("register " + line + " --file @rules.d/70-ostra.rules");
    }
    std::string Rules() { return ReadText(file_); }

    ToolRunner tool_;
    const std::string file_ = tool_.folder.Path("rules.d/70-ostra.rules");
};

/// The rule of one kind of device, as it is written now or was once.
std::string Rule(const std::string& vendor, const std::string& product,
                 const char* end = ", MODE=\"0660\", GROUP=\"plugdev\"\n") {
    return "SUBSYSTEM==\"usb\", ENV{DEVTYPE}==\"usb_device\", ATTR{idVendor}==\"" + vendor +
           "\", ATTR{idProduct}==\"" + product + "\", ENV{OSTRA_INTERFACE_CLASS}=\"1\", TAG+=\"uaccess\"" +
           end;
}

TEST_F(RegisterTest, WritesARuleForEachKindOnceAndTakesItBack) {
    for (const char* id : {"1209:00AB", "04b4:1003", "1209:00ab"}) {
        ASSERT_EQ(Register(id), ExitCode::Success) << tool_.Err();
    }
    EXPECT_EQ(Rules().substr(Rules().find("SUBSYSTEM")), Rule("1209", "00ab") + Rule("04b4", "1003"));
    EXPECT_EQ(Register("1209:0002 --remove"), ExitCode::NoInstrument);
    EXPECT_EQ(Register("1209:00ab --remove"), ExitCode::Success);
    EXPECT_EQ(Rules().substr(Rules().find("SUBSYSTEM")), Rule("04b4", "1003"));
    EXPECT_EQ(Register("04b4:1003 --remove"), ExitCode::Success);
    EXPECT_FALSE(std::filesystem::exists(file_)) << "a rule file without rules is of no use";
}

TEST_F(RegisterTest, LeavesOtherRulesAlone) {
    ASSERT_EQ(Register("1209:0001"), ExitCode::Success);
    std::string rules = Rules();
    rules.insert(rules.size() - 1, ", SYMLINK+=\"meter\"");
    const std::string others = "# mine\nSUBSYSTEM==\"tty\", MODE=\"0666\"\n # " + Rule("1209", "0001");
    const auto both = rules + others;
    WriteFile(file_, {both.begin(), both.end()});
    EXPECT_EQ(Register("1209:0001"), ExitCode::Success);
    EXPECT_EQ(Rules(), both);
    EXPECT_EQ(Register("1209:0001 --remove"), ExitCode::Success);
    EXPECT_EQ(Rules(), rules.substr(0, rules.find("SUBSYSTEM")) + others);
    EXPECT_EQ(Register("1209:0001 --remove"), ExitCode::NoInstrument) << "a comment is no rule";
}

TEST_F(RegisterTest, KnowsTheRulesOfOlderVersions) {
    const std::string old =
        "# Written by `ostra register`: these USB devices are measuring instruments.\n"
        "# The library looks for the property; the tag gives the user at the seat access.\n" +
        Rule("1209", "0001", "\n") + Rule("1209", "0002", "\n");
    std::filesystem::create_directories(std::filesystem::path(file_).parent_path());
    WriteFile(file_, {old.begin(), old.end()});
    ASSERT_EQ(Register("1209:0002"), ExitCode::Success) << tool_.Err();
    EXPECT_EQ(Rules().substr(Rules().find("SUBSYSTEM")), Rule("1209", "0001", "\n") + Rule("1209", "0002"));
    EXPECT_NE(Rules().find("the group its members"), std::string::npos) << Rules();
    WriteFile(file_, {old.begin(), old.end()});
    EXPECT_EQ(Register("1209:0001 --remove"), ExitCode::Success) << tool_.Err();
    EXPECT_EQ(Register("1209:0002 --remove"), ExitCode::Success) << tool_.Err();
    EXPECT_FALSE(std::filesystem::exists(file_)) << Rules();
}

TEST_F(RegisterTest, DryRunsAndMistakesChangeNothing) {
    EXPECT_EQ(Register("1209:0001 --dry-run"), ExitCode::Success);
    EXPECT_NE(tool_.Out().find("ATTR{idProduct}==\"0001\""), std::string::npos) << tool_.Out();
    EXPECT_FALSE(std::filesystem::exists(file_));
    ASSERT_EQ(Register("1209:0001"), ExitCode::Success);
    const std::string before = Rules();
    EXPECT_EQ(Register("1209:0001 --remove --dry-run"), ExitCode::Success);
    EXPECT_NE(tool_.Out().find("would remove"), std::string::npos) << tool_.Out();
    for (const char* id : {"''", "1209", "1209:1", "1209-0001", "1209:000g", "1209:00011", "\"1209:0001"}) {
        EXPECT_EQ(Register(id), ExitCode::Usage) << id;
    }
    EXPECT_NE(tool_.Err().find("hexadecimal digits each, such as 1209:0001; `ostra list --candidates`"),
              std::string::npos);
    EXPECT_EQ(Rules(), before);
}

}  // namespace
}  // namespace Varnholt::Tests
