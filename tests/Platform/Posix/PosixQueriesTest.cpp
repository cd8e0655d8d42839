#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/utsname.h>

#include <cerrno>
#include <set>
#include <string>

#include "Platform/ErrorCodes.h"
#include "Platform/HostQueries.h"
#include "Platform/Posix/ErrnoCodes.h"

namespace Varnholt::Platform {
namespace {

using testing::EndsWith;
using testing::HasSubstr;

TEST(ErrorTexts, AreSentencesOfTheirOwn) {
    using namespace Errors;
    std::set<std::string> texts;
    for (const ErrorCode code : {Success,
                                 FileNotFound,
                                 PathNotFound,
                                 AccessDenied,
                                 InvalidHandle,
                                 NotEnoughMemory,
                                 InvalidData,
                                 NotReady,
                                 GeneralFailure,
                                 NotSupported,
                                 InvalidParameter,
                                 CallNotImplemented,
                                 SemaphoreTimeout,
                                 InsufficientBuffer,
                                 ModuleNotFound,
                                 ProcedureNotFound,
                                 Busy,
                                 NoMoreItems,
                                 NotOwner,
                                 TooManyPosts,
                                 OperationAborted,
                                 IoIncomplete,
                                 IoPending,
                                 DeviceNotConnected,
                                 NoSystemResources}) {
        const std::string text = ErrorText(code);
        EXPECT_THAT(text, EndsWith("."));
        EXPECT_THAT(text, testing::Not(HasSubstr("\n")));
        EXPECT_THAT(text, testing::Not(HasSubstr("Unknown"))) << code;
        EXPECT_TRUE(texts.insert(text).second) << text;
    }
    EXPECT_EQ(ErrorText(1234), "Unknown error 1234.");
    EXPECT_EQ(ErrorText(0xE000100C), "Unknown error 3758100492.");
}

TEST(ErrnoCodes, AreMappedToTheCodesOfThisSystem) {
    struct {
        int value;
        ErrorCode code;
    } const cases[] = {{0, Errors::Success},           {ENOENT, Errors::FileNotFound},
                       {EACCES, Errors::AccessDenied}, {ENODEV, Errors::DeviceNotConnected},
                       {EBUSY, Errors::Busy},          {ETIMEDOUT, Errors::SemaphoreTimeout},
                       {EIO, Errors::GeneralFailure},  {EMFILE, Errors::NoSystemResources}};
    for (const auto& mapped : cases) {
        EXPECT_EQ(Posix::CodeOf(mapped.value), mapped.code) << mapped.value;
    }
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

TEST(HostAnswers, CanBeReplaced) {
    const VersionRecord own = ReadVersionRecord();
    OverrideVersionRecord(VersionRecord{1, 4, 10, 2222, "A"});
    EXPECT_EQ(ReadVersionRecord().build, 2222u);
    OverrideVersionRecord(std::nullopt);
    EXPECT_EQ(ReadVersionRecord().major, own.major);
    EXPECT_EQ(Overridden64BitHost(), std::nullopt);
    Override64BitHost(false);
    EXPECT_EQ(Overridden64BitHost(), false);
    Override64BitHost(std::nullopt);
    EXPECT_EQ(Overridden64BitHost(), std::nullopt);
}

}  // namespace
}  // namespace Varnholt::Platform
