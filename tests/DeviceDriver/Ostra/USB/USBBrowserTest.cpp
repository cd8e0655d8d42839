#include <utility>

#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "DeviceDriver/Ostra/USB/USBBrowser.h"
#include "Platform/CallFilter.h"
#include "Platform/HostQueries.h"
#include "Support/DriverTest.h"
#include "Support/Transport.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Ostra::LowLevel::PellandoUSBDevice;
using DeviceDriver::Ostra::USB::USBBrowser;
using testing::IsEmpty;

class Browser : public DriverTest, public testing::WithParamInterface<Transport> {
  protected:
    Browser() { Override64BitHost(!IsNative()); }
    ~Browser() override {
        InstallCallFilter({});
        Override64BitHost(std::nullopt);
    }

    static bool IsNative() { return GetParam() == Transport::Native; }
    static Lines Paths(std::size_t count) {
        Lines paths;
        for (std::size_t i = 0; i < count; ++i) {
            paths.push_back(Name(GetParam()) + ("/" + std::to_string(i)));
        }
        return paths;
    }
};

TEST_P(Browser, ListsAfreshUpTo127Instruments) {
    const auto browser = USBBrowser::Instance();
    EXPECT_NE(browser.Get(), USBBrowser::Instance().Get());
    for (const std::size_t count : {0u, 1u, 3u, 127u, 130u}) {
        ScriptedDriver connected(Paths(count));
        const ScopedDeviceFiles inForce(connected);
        for (const std::int32_t selector : {0, 1}) {
            EXPECT_THAT(browser->GetDevices(selector),
                        testing::ElementsAreArray(Paths(std::min<std::size_t>(count, 127))));
        }
        EXPECT_EQ(browser->IsAnyOstraConnected(), count > 0);
        EXPECT_EQ(connected.OpenFiles(), 0U);
        if (IsNative()) {
            EXPECT_EQ(PellandoUSBDevice::ScanDevice(2), count > 2 ? Paths(3)[2] : "");
            EXPECT_EQ(PellandoUSBDevice::ScanDevice(static_cast<std::uint16_t>(count)), "");
            EXPECT_EQ(PellandoUSBDevice::ScanDevice(0xFFFF), "");
        }
    }
}

TEST_P(Browser, ListsNothingWhenThePlatformCannotTell) {
    for (const char* call : {"MakeList", "LoadEnumeration", "ReadPath"}) {
        SCOPED_TRACE(call);
        bool wasAsked = false;
        InstallCallFilter([&](std::string_view name) {
            wasAsked = wasAsked || name == call;
            return name == call ? Errors::InvalidData : Errors::Success;
        });
        EXPECT_THAT(USBBrowser::Instance()->GetDevices(0), IsEmpty());
        EXPECT_TRUE(wasAsked);
    }
}

TEST_P(Browser, ListsOverUsbIoOnlyWhatOpens) {
    ScriptedDriver three(Paths(3));
    const ScopedDeviceFiles inForce(three);
    three.RefuseOpen(Paths(2)[1], Errors::AccessDenied);
    const auto devices = USBBrowser::Instance()->GetDevices(0);
    EXPECT_THAT(devices, testing::ElementsAreArray(Paths(IsNative() ? 3 : 1)));
}

using NativeScan = DriverTest;

TEST_F(NativeScan, EndsWithTheList) {
    const Lines paths{"native/0", "native/1", "native/2"};
    for (std::ptrdiff_t count : {0, 1, 3}) {
        ScriptedDriver connected(Lines(paths.begin(), paths.begin() + count));
        const ScopedDeviceFiles inForce(connected);
        std::ptrdiff_t scans = 0;
        InstallCallFilter([&](std::string_view call) {
            scans += call == "MakeList" ? 1 : 0;
            return Errors::Success;
        });
        EXPECT_THAT(PellandoUSBDevice::GetAllDevices(), testing::SizeIs(count));
        EXPECT_EQ(scans, count + 1);
    }
    InstallCallFilter({});
}

INSTANTIATE_TEST_SUITE_P(Transports, Browser, testing::Values(Transport::Native, Transport::UsbIo),
                         [](const auto& parameter) { return std::string(Name(parameter.param)); });

}  // namespace
}  // namespace Varnholt::Tests
