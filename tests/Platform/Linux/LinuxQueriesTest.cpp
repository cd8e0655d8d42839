#include <gmock/gmock.h>
#include <sys/utsname.h>

#include <set>
#include <string>

#include "Platform/ErrorCodes.h"
#include "Platform/HostQueries.h"

namespace Varnholt::Platform {
namespace {

TEST(ErrorTexts, AreSentencesOfTheirOwn) {
    std::set<std::string> texts;
    for (const ErrorCode code : {0u, 2u, 5u, 31u, 170u, 996u, 1167u}) {
        EXPECT_THAT(ErrorText(code), testing::MatchesRegex("[A-TV-Z][^\n]*\\."));
        EXPECT_TRUE(texts.insert(ErrorText(code)).second) << code;
    }
    EXPECT_EQ(ErrorText(0xE000100C), "Unknown error 3758100492.");
}

TEST(HostAnswers, ComeFromTheKernel) {
    utsname host{};
    ASSERT_EQ(uname(&host), 0);
    const VersionRecord record = ReadVersionRecord();
    const std::string version = std::to_string(record.major) + "." + std::to_string(record.minor) + ".";
    EXPECT_THAT(host.release, testing::StartsWith(version));
    EXPECT_EQ(record.servicePack, std::string(host.sysname) + " " + host.release);
    EXPECT_GT(record.platformId, 2u) << "no Windows, whose names would be untrue";

    const Is64BitHostQuery query = LookUp64BitHostQuery();
    ASSERT_NE(query, nullptr);
    int flag = 7;
    EXPECT_TRUE(query(flag));
    if (sizeof(void*) == 8) {
        EXPECT_EQ(flag, 1);
    }
}

}  // namespace
}  // namespace Varnholt::Platform
