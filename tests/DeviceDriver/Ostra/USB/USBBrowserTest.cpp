#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "DeviceDriver/Ostra/USB/USBBrowser.h"
#include "Support/DriverTest.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Ostra::LowLevel::PellandoUSBDevice;
using DeviceDriver::Ostra::USB::USBBrowser;

class Browser : public TransportTest {};

TEST_P(Browser, ListsAfreshUpTo127Instruments) {
    const auto browser = USBBrowser::Instance();
    EXPECT_NE(browser.Get(), USBBrowser::Instance().Get());
    for (const std::size_t count : {0u, 1u, 3u, 127u, 130u}) {
        ScriptedDriver connected(Paths(count));
        const ScopedDeviceFiles inForce(connected);
        const Lines listed = Paths(std::min<std::size_t>(count, 127));
        std::size_t lists = 0;
        InstallCallFilter([&](std::string_view call) {
            lists += call == "MakeList" ? 1U : 0U;
            return Errors::Success;
        });
        EXPECT_THAT(browser->GetDevices(0), ElementsAreArray(listed));
        InstallCallFilter({});
        EXPECT_EQ(lists, IsNative() ? std::min<std::size_t>(count + 1, 127) : 1U) << "once for each index";
        EXPECT_THAT(browser->GetDevices(1), ElementsAreArray(listed));
        EXPECT_EQ(browser->IsAnyOstraConnected(), count > 0);
        EXPECT_EQ(connected.OpenFiles(), 0U);
        if (IsNative()) {
            EXPECT_EQ(PellandoUSBDevice::ScanDevice(2), count > 2 ? Paths(3)[2] : "");
            EXPECT_EQ(PellandoUSBDevice::ScanDevice(0xFFFF), "");
        }
    }
    ScriptedDriver three(Paths(3));
    const ScopedDeviceFiles inForce(three);
    three.RefuseOpen(Paths(2)[1], Errors::AccessDenied);
    EXPECT_THAT(browser->GetDevices(0), ElementsAreArray(Paths(IsNative() ? 3 : 1))) << "those that open";
    for (const char* failing : {"MakeList", "LoadEnumeration", "ReadPath"}) {
        FailCalls(failing, Errors::InvalidData);
        EXPECT_THAT(browser->GetDevices(0), testing::IsEmpty()) << failing;
    }
}

OSTRA_ON_BOTH_TRANSPORTS(Browser);

}  // namespace
}  // namespace Varnholt::Tests
