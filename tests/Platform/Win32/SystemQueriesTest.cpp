#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <vector>

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
    InterfaceRecord record;
    EXPECT_FALSE(DeviceInterfaces::Find(list, InterfaceClass, 0, record));
    EXPECT_EQ(LastError(), Errors::NoMoreItems);
    EXPECT_EQ(DeviceInterfaces::DetailSize(list, record), 0U);
    std::array<std::byte, 64> detail{};
    std::memcpy(detail.data(), &InterfaceDetailSizeField, sizeof InterfaceDetailSizeField);
    EXPECT_FALSE(DeviceInterfaces::ReadDetail(list, record, detail));
    EXPECT_TRUE(DeviceInterfaces::DestroyList(list));
    EXPECT_FALSE(DeviceInterfaces::Find(list, InterfaceClass, 0, record));
    EXPECT_EQ(LastError(), Errors::InvalidHandle);
    EXPECT_FALSE(DeviceInterfaces::DestroyList(list));
}

}  // namespace
}  // namespace Varnholt::Platform
