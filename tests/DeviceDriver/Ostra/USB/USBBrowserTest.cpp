#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <optional>

#include "DeviceDriver/Ostra/USB/USBBrowser.h"
#include "Platform/CallFilter.h"
#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/HostQueries.h"
#include "Support/ScriptedUsbDevice.h"

namespace Varnholt::Tests {
namespace {

using DeviceDriver::Ostra::USB::USBBrowser;
using testing::ElementsAre;
using testing::IsEmpty;

/// Both transports list the same bus; the path tells which of them was asked.
class Browser : public testing::TestWithParam<bool> {
  protected:
    void SetUp() override { Platform::Override64BitHost(GetParam()); }
    void TearDown() override {
        Platform::InstallCallFilter({});
        Platform::Override64BitHost(std::nullopt);
    }
    std::string Path(const std::string& port) const { return (GetParam() ? "usbio/" : "native/") + port; }

    ScriptedBus bus;
    const std::unique_ptr<Platform::DeviceFileSystem> drivers = Platform::Drivers::MakeDriverFileSystem(bus);
    const Platform::ScopedDeviceFiles inForce{*drivers};
};

TEST_P(Browser, ListsAfreshWhatIsPluggedIn) {
    const auto browser = USBBrowser::Instance();
    EXPECT_NE(browser.Get(), USBBrowser::Instance().Get());
    EXPECT_THAT(browser->GetDevices(0), IsEmpty());
    EXPECT_FALSE(browser->IsAnyOstraConnected());

    bus.Plug("port1", std::make_shared<ScriptedUsbDevice>());
    bus.Plug("port2", std::make_shared<ScriptedUsbDevice>());
    for (const std::int32_t selector : {0, 1}) {
        EXPECT_THAT(browser->GetDevices(selector), ElementsAre(Path("port1"), Path("port2")));
    }
    EXPECT_TRUE(browser->IsAnyOstraConnected());

    bus.Unplug("port1");
    EXPECT_THAT(browser->GetDevices(0), ElementsAre(Path("port2")));
}

TEST_P(Browser, ListsNothingWhenThePlatformCannotTell) {
    bus.Plug("port1", std::make_shared<ScriptedUsbDevice>());
    Platform::InstallCallFilter([](std::string_view call) {
        return call == "MakeList" ? Platform::Errors::NotEnoughMemory : Platform::Errors::Success;
    });
    EXPECT_THAT(USBBrowser::Instance()->GetDevices(0), IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(Transports, Browser, testing::Bool());

}  // namespace
}  // namespace Varnholt::Tests
