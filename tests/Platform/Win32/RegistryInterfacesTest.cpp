#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>

#include "Platform/DeviceFiles.h"
#include "Platform/DeviceInterfaces.h"
#include "Platform/HostQueries.h"
#include "Platform/Win32/RegistryInterfaces.h"
#include "Platform/Win32/Windows.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Platform {
namespace {

using Protocol::NativeDriver::InterfaceClass;
using testing::ElementsAre;
using testing::IsEmpty;

struct NameCase {
    const char* description;
    std::string valueName;
    bool matches;
};

TEST(RegistryInterfaces, ClassIsReadFromTheValueName) {
    const NameCase cases[] = {
        {"the class alone", "{00873FDF-61A8-11D1-AA5E-00C04FB1728B}", true},
        {"lower case", "{00873fdf-61a8-11d1-aa5e-00c04fb1728b}", true},
        {"something behind it", "{00873FDF-61A8-11D1-AA5E-00C04FB1728B}\\0001", true},
        {"another class", "{989D6515-E122-4442-A357-751457F102A5}", false},
        {"another first number", "{00873FDE-61A8-11D1-AA5E-00C04FB1728B}", false},
        {"another byte in the fourth group", "{00873FDF-61A8-11D1-AA5F-00C04FB1728B}", false},
        {"another last byte", "{00873FDF-61A8-11D1-AA5E-00C04FB1728C}", false},
        {"fourth group too short", "{00873FDF-61A8-11D1-AA5-00C04FB1728B}", false},
        {"last group too short", "{00873FDF-61A8-11D1-AA5E-00C04FB1728}", false},
        {"no hexadecimal digits at the end", "{00873FDF-61A8-11D1-AA5E-00C04FB172XY}", false},
        {"no brace", "00873FDF-61A8-11D1-AA5E-00C04FB1728B", false},
        {"empty", "", false},
        {"groups longer than any buffer", "{00873FDF-61A8-11D1-" + std::string(5000, 'A') + "}", false},
    };
    for (const NameCase& row : cases) {
        EXPECT_EQ(NamesInterfaceOf(InterfaceClass, row.valueName), row.matches) << row.description;
    }
}

/// The registry key of the old hosts, for the test's time.
class OldRegistry : public testing::Test {
  protected:
    OldRegistry() {
        OverrideVersionRecord(VersionRecord{2, 4, 0, 1381, "Service Pack 6"});
        RegCreateKeyExA(HKEY_LOCAL_MACHINE, Path, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key_, nullptr);
    }
    ~OldRegistry() override {
        RegCloseKey(key_);
        RegDeleteKeyA(HKEY_LOCAL_MACHINE, Path);
        OverrideVersionRecord(std::nullopt);
    }

    void Add(const std::string& valueName) {
        const BYTE data[] = {1, 0, 0, 0};
        ASSERT_EQ(RegSetValueExA(key_, valueName.c_str(), 0, REG_DWORD, data, sizeof data), ERROR_SUCCESS);
    }

    static constexpr const char* Path = "System\\CurrentControlSet\\Control\\WinDK\\DeviceNotification";
    HKEY key_ = nullptr;
};

TEST_F(OldRegistry, ValuesOfTheClassAreTheInterfaces) {
    const std::string first = "{00873FDF-61A8-11D1-AA5E-00C04FB1728B}\\0000";
    const std::string longest = "{00873FDF-61A8-11D1-AA5E-00C04FB1728B}" + std::string(2000, 'x');
    Add(first);
    Add("{989D6515-E122-4442-A357-751457F102A5}\\0000");
    Add(longest);
    EXPECT_THAT(SystemDeviceFiles().ListInterfaces(InterfaceClass),
                ElementsAre("\\\\.\\" + first, "\\\\.\\" + longest));
}

TEST_F(OldRegistry, AnswersOnlyOldHostsAndOnlyWhenAsked) {
    const std::string name = "{00873FDF-61A8-11D1-AA5E-00C04FB1728B}\\0000";
    Add(name);
    const auto finds = [](bool withRegistryFallback) {
        const DeviceList list = DeviceInterfaces::MakeList(InterfaceClass, withRegistryFallback);
        std::string path;
        DeviceInterfaces::ReadPath(list, InterfaceClass, 0, path);
        return path;
    };
    EXPECT_EQ(finds(true), "\\\\.\\" + name);
    EXPECT_EQ(finds(false), "");
    OverrideVersionRecord(VersionRecord{2, 5, 0, 2195, ""});
    EXPECT_EQ(finds(true), "");
    OverrideVersionRecord(VersionRecord{1, 4, 10, 1998, ""});
    EXPECT_EQ(finds(true), "");
}

TEST_F(OldRegistry, WithoutTheKeyThereIsNothing) {
    RegDeleteKeyA(HKEY_LOCAL_MACHINE, Path);
    EXPECT_THAT(ListRegistryInterfaces(InterfaceClass), IsEmpty());
}

}  // namespace
}  // namespace Varnholt::Platform
