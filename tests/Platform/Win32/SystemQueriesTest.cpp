#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "Platform/DeviceInterfaces.h"
#include "Platform/ErrorCodes.h"
#include "Platform/HostQueries.h"
#include "Platform/Win32/Windows.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Platform {
namespace {

using Protocol::UsbIoDriver::InterfaceClass;

TEST(SystemQueries, HostTellsWhetherItIs64Bit) {
    SYSTEM_INFO system{};
    GetNativeSystemInfo(&system);
    const Is64BitHostQuery query = LookUp64BitHostQuery();
    ASSERT_NE(query, nullptr);
    int flag = 7;
    EXPECT_TRUE(query(flag));
    EXPECT_EQ(flag != 0, system.wProcessorArchitecture == PROCESSOR_ARCHITECTURE_AMD64);
}

TEST(SystemQueries, VersionRecordIsTheSystems) {
    const VersionRecord record = ReadVersionRecord();
    EXPECT_EQ(record.platformId, 2U);
    EXPECT_EQ(record.build & 0xFFFF, GetVersion() >> 16);
    EXPECT_EQ(record.major, GetVersion() & 0xFF);
}

TEST(SystemQueries, ErrorTextsComeAsTheSystemGivesThem) {
    EXPECT_THAT(ErrorText(Errors::IoIncomplete), testing::EndsWith("\r\n"));
    // A message with inserts stays as it is.
    EXPECT_THAT(ErrorText(193), testing::HasSubstr("%1"));
    EXPECT_EQ(ErrorText(0xE0001000), "");
}

TEST(SystemInterfaces, ClassWithoutDevicesGivesAnEmptyList) {
    const DeviceList list = DeviceInterfaces::MakeList(InterfaceClass, false);
    ASSERT_NE(list, nullptr);
    std::string path;
    EXPECT_EQ(DeviceInterfaces::ReadPath(list, InterfaceClass, 0, path), Errors::NoMoreItems);
    EXPECT_EQ(DeviceInterfaces::ReadPath(nullptr, InterfaceClass, 0, path), Errors::InvalidHandle);
}

}  // namespace
}  // namespace Varnholt::Platform
