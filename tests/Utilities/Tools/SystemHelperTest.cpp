#include <gtest/gtest.h>

#include <string>

#include "Utilities/Tools/Win32/SystemHelperWin.h"

namespace Varnholt::Utilities::Tools {
namespace {

struct SystemHelper : testing::Test {
    ~SystemHelper() override {
        Platform::OverrideVersionRecord(std::nullopt);
        Platform::Override64BitHost(std::nullopt);
    }
};

TEST_F(SystemHelper, DescribesEditionServicePackAndBuild) {
    const std::vector<std::tuple<Platform::VersionRecord, std::string>> cases{
        {{0, 3, 10, 7, ""}, "Microsoft Windows 3.1 / Win32s  (Build 7)"},
        {{1, 4, 0, 0x040003B6, ""}, "Microsoft Windows 95  (Build 950)"},
        {{1, 4, 10, 0x040A08AE, " A "}, "Microsoft Windows 98  A  (Build 2222)"},
        {{1, 4, 90, 0x045A0BB8, ""}, "Microsoft Windows Me  (Build 3000)"},
        {{2, 4, 0, 1381, ""}, "Microsoft Windows NT  (Build 1381)"},
        {{2, 5, 0, 2195, "Service Pack 4"}, "Microsoft Windows 2000 Service Pack 4 (Build 2195)"},
        {{2, 5, 2, 3790, ""}, "Microsoft Windows 2003  (Build 3790)"},
        {{2, 5, 3, 1, ""}, "Microsoft Windows ?  (Build 1)"},
        {{2, 6, 1, 7601, ""}, "Microsoft Windows XP  (Build 7601)"},
        {{3, 5, 1, 1, ""}, "Microsoft Windows Unknown Windows version  (Build 1)"},
    };
    for (const auto& [record, description] : cases) {
        Platform::OverrideVersionRecord(record);
        EXPECT_EQ(GetOSDescription(), description);
        EXPECT_EQ(GetOSVersion(), std::to_string(record.major) + "." + std::to_string(record.minor));
    }
}

TEST_F(SystemHelper, HostIsOf64BitsAsItsQueryOrTheOverrideSays) {
    EXPECT_FALSE(Is64BitOS(nullptr));
    EXPECT_FALSE(Is64BitOS(+[](int&) { return true; }));
    EXPECT_TRUE(Is64BitOS(+[](int& flag) {
        flag = -2;
        return false;
    })) << "the flag alone decides";
    for (const bool answer : {true, false}) {
        Platform::Override64BitHost(answer);
        EXPECT_EQ(Is64BitOS(), answer);
    }
}

}  // namespace
}  // namespace Varnholt::Utilities::Tools
