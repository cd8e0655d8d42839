#include <gmock/gmock.h>

#include "Platform/ErrorCodes.h"
#include "Platform/HostQueries.h"
#include "Platform/WaitableObjects.h"
#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

TEST(SystemQueries, HostTellsWhetherItIs64Bit) {
    SYSTEM_INFO system{};
    GetNativeSystemInfo(&system);
    const Is64BitHostQuery query = LookUp64BitHostQuery();
    ASSERT_NE(query, nullptr);
    int flag = 7;
    EXPECT_TRUE(query(flag));
    EXPECT_EQ(flag != 0, system.wProcessorArchitecture == PROCESSOR_ARCHITECTURE_AMD64);
}

/// So that other programs which use the instrument find its lock.
TEST(SystemQueries, MutexesHaveTheNamesThatTheyAreGiven) {
    const OwnedHandle mutex(MakeMutex("ostra-test-lock"));
    const HANDLE same = OpenMutexA(SYNCHRONIZE, FALSE, "ostra-test-lock");
    EXPECT_NE(same, nullptr);
    CloseHandle(same);
}

TEST(SystemQueries, ErrorTextsComeAsTheSystemGivesThem) {
    EXPECT_THAT(ErrorText(Errors::IoIncomplete), testing::EndsWith("\r\n"));
    // A message with inserts stays as it is.
    EXPECT_THAT(ErrorText(193), testing::HasSubstr("%1"));
    EXPECT_EQ(ErrorText(0xE0001000), "");
}

}  // namespace
}  // namespace Varnholt::Platform
