#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Utilities/Tools/Win32/SystemHelperWin.h"

namespace Varnholt::Utilities::Tools {
namespace {

class SystemHelper : public testing::Test {
  protected:
    ~SystemHelper() override {
        Platform::OverrideVersionRecord(std::nullopt);
        Platform::Override64BitHost(std::nullopt);
    }
};

TEST_F(SystemHelper, NamesTheEditionByFamilyAndVersion) {
    struct Case {
        std::uint32_t platformId, major, minor;
        const char* expected;
    };
    const std::vector<Case> cases{
        {0, 3, 10, "3.1 / Win32s"},
        {0, 5, 1, "3.1 / Win32s"},
        {1, 4, 0, "95"},
        {1, 4, 10, "98"},
        {1, 4, 90, "Me"},
        {1, 4, 1, "95"},
        {2, 4, 0, "NT"},
        {2, 3, 51, "NT"},
        {2, 5, 0, "2000"},
        {2, 5, 1, "XP"},
        {2, 5, 2, "2003"},
        {2, 5, 3, "?"},
        {2, 6, 1, "XP"},
        {2, 10, 0, "2000"},
        {3, 5, 1, "Unknown Windows version"},
    };
    for (const Case& row : cases) {
        Platform::OverrideVersionRecord(Platform::VersionRecord{row.platformId, row.major, row.minor, 0, ""});
        EXPECT_EQ(GetOSName(), row.expected) << row.platformId << " " << row.major << "." << row.minor;
        EXPECT_EQ(GetOSVersion(), std::to_string(row.major) + "." + std::to_string(row.minor));
    }
}

TEST_F(SystemHelper, DescribesServicePackAndBuild) {
    Platform::OverrideVersionRecord(Platform::VersionRecord{2, 5, 1, 2600, "Service Pack 3"});
    EXPECT_EQ(GetServicePack(), "Service Pack 3 (Build 2600)");
    EXPECT_EQ(GetOSDescription(), "Microsoft Windows XP Service Pack 3 (Build 2600)");
    Platform::OverrideVersionRecord(Platform::VersionRecord{2, 5, 1, 2600, ""});
    EXPECT_EQ(GetOSDescription(), "Microsoft Windows XP  (Build 2600)");
    Platform::OverrideVersionRecord(Platform::VersionRecord{1, 4, 10, 0x040A08AE, " A "});
    EXPECT_EQ(GetServicePack(), " A  (Build 2222)");
}

TEST_F(SystemHelper, HostIsOf64BitsAsItsQueryOrTheOverrideSays) {
    EXPECT_FALSE(Is64BitOS(nullptr));
    EXPECT_FALSE(Is64BitOS(+[](int&) { return true; }));
    EXPECT_TRUE(Is64BitOS(+[](int& flag) {
        flag = -2;
        return false;
    })) << "the flag alone decides";
    const bool ofHost = Is64BitOS();
    EXPECT_EQ(ofHost, Is64BitOS(Platform::LookUp64BitHostQuery()));
    for (const bool answer : {true, false}) {
        Platform::Override64BitHost(answer);
        EXPECT_EQ(Is64BitOS(), answer);
    }
}

}  // namespace
}  // namespace Varnholt::Utilities::Tools
