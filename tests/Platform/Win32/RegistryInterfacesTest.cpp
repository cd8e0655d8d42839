#include <gmock/gmock.h>

#include <optional>
#include <string>
#include <utility>
#include <vector>

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

TEST(RegistryInterfaces, ClassIsReadFromTheValueName) {
    for (const auto& [valueName, matches] : std::vector<std::pair<std::string, bool>>{
             {"{00873FDF-61A8-11D1-AA5E-00C04FB1728B}", true},
             {"{00873fdf-61a8-11d1-aa5e-00c04fb1728b}", true},
             {"{00873FDF-61A8-11D1-AA5E-00C04FB1728B}\\0001", true},
             {"{989D6515-E122-4442-A357-751457F102A5}", false},
             {"{00873FDE-61A8-11D1-AA5E-00C04FB1728B}", false},
             {"{00873FDF-61A8-11D1-AA5-00C04FB1728B}", false},
             {"{00873FDF-61A8-11D1-AA5E-00C04FB1728}", false},
             {"{00873FDF-61A8-11D1-AA5E-00C04FB172XY}", false},
             {"00873FDF-61A8-11D1-AA5E-00C04FB1728B", false},
             {"", false},
             {"{00873FDF-61A8-11D1-" + std::string(5000, 'A') + "}", false},
         }) {
        EXPECT_EQ(NamesInterfaceOf(InterfaceClass, valueName), matches) << valueName.substr(0, 50);
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
    RegDeleteKeyA(HKEY_LOCAL_MACHINE, Path);
    EXPECT_THAT(ListRegistryInterfaces(InterfaceClass), testing::IsEmpty());
}

}  // namespace
}  // namespace Varnholt::Platform
