// The library on a real Linux kernel: runs inside the virtual machine, where ostra-simulator plugs itself
// into the kernel's virtual USB host. Everything goes through usbfs and libusb.
#include <gmock/gmock.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <span>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "DeviceDriver/Ostra/USB/USBBrowser.h"
#include "ostra.h"
#include "Platform/HostQueries.h"
#include "Platform/Linux/ForkedProcess.h"
#include "Platform/Usb/UdevBus.h"
#include "Support/Bytes.h"
#include "Support/ResourceCount.h"
#include "Support/TestFolder.h"

namespace Varnholt::Tests {
namespace {

using DeviceDriver::Generic::EventListener;
using DeviceDriver::Generic::Utilities::DeviceDriverException;
using DeviceDriver::Ostra::LowLevel::PellandoFunctionality;
using DeviceDriver::Ostra::USB::USBBrowser;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

bool WaitFor(const std::function<bool()>& condition, milliseconds limit = milliseconds(8000)) {
    const auto end = steady_clock::now() + limit;
    while (!condition()) {
        if (steady_clock::now() > end) {
            return false;
        }
        std::this_thread::sleep_for(milliseconds(20));
    }
    return true;
}

bool AnyPluggedIn() {
    return !Platform::Usb::ListRegisteredDevices().empty();
}

/// A port is free again some time after its device was unplugged.
bool AllPortsFree() {
    std::ifstream status("/sys/devices/platform/vhci_hcd.0/status");
    std::string line;
    std::getline(status, line);
    while (std::getline(status, line)) {
        if (line.find(" 004 ") == std::string::npos) {
            return false;
        }
    }
    return true;
}

/// ostra-simulator, plugged into the kernel for the object's life.
class PluggedInstrument final {
  public:
    explicit PluggedInstrument(std::vector<std::string> arguments) {
        EXPECT_TRUE(WaitFor(&AllPortsFree)) << "the port does not become free";
        arguments.insert(arguments.begin(), {"/root/ostra-simulator", "--attach"});
        process_.emplace([&arguments] {
            std::vector<char*> words;
            std::ranges::transform(arguments, std::back_inserter(words),
                                   [](std::string& word) { return word.data(); });
            words.push_back(nullptr);
            (void)!freopen("/dev/null", "w", stdout);
            return execv(words[0], words.data());
        });
        EXPECT_TRUE(WaitFor(&AnyPluggedIn)) << "the kernel does not show the instrument";
    }
    ~PluggedInstrument() {
        Unplug();
        WaitFor([] { return !AnyPluggedIn(); });
    }

    void Unplug() { process_.reset(); }

  private:
    std::optional<Platform::ForkedProcess> process_;
};

std::string LastError() {
    return b5ae189db26b2a1b("LastError");
}

class OnKernel : public testing::TestWithParam<bool> {
  protected:
    OnKernel() { Platform::Override64BitHost(GetParam()); }
    ~OnKernel() override { Platform::Override64BitHost(std::nullopt); }
};
INSTANTIATE_TEST_SUITE_P(Transports, OnKernel, testing::Bool(),
                         [](const auto& parameter) { return parameter.param ? "usbio" : "native"; });

TEST_P(OnKernel, WritesAnImageAndReadsItBackAndLeavesNothingBehind) {
    const PluggedInstrument plugged({});
    const auto image = CountingImage();
    const auto devices = USBBrowser::Instance()->GetDevices(0);
    ASSERT_FALSE(devices.empty());
    ASSERT_EQ(f3355d91d5df0e0b(image.data(), devices.front().c_str()), OSTRA_OK) << LastError();
    std::array<std::int32_t, OSTRA_READOUT_VALUES> values{};
    const auto before = TestSupport::ResourceCount::TakeSettled();
    ASSERT_EQ(d4fb86cecc88582a(values.data(), ""), OSTRA_OK) << LastError();
    EXPECT_TRUE(before.Settles()) << TestSupport::ResourceCount() << " were " << before;
    EXPECT_NE(*std::ranges::max_element(values), *std::ranges::min_element(values));
    PellandoFunctionality instrument(nullptr, 0);
    std::vector<std::uint8_t> half(4096);
    for (const std::uint32_t start : {0U, 4096U}) {
        instrument.ReadEEPROM(start, half);
        EXPECT_TRUE(std::ranges::equal(half, std::span(image).subspan(start, half.size()))) << start;
    }
}

TEST_P(OnKernel, ReportsTheButtonAndTheRemoval) {
    struct Listener final : EventListener {
        void MessageFromDevice(std::uint32_t code, std::uint32_t) override {
            ++(code == DeviceDriver::Generic::MessageButtonData ? pressed : removed);
        }
        std::atomic<int> pressed = 0;
        std::atomic<int> removed = 0;
    } listener;
    PluggedInstrument plugged({"--button-after", "1500"});
    PellandoFunctionality instrument(&listener, 0);
    EXPECT_TRUE(WaitFor([&] { return listener.pressed == 1; }));
    plugged.Unplug();
    EXPECT_TRUE(WaitFor([&] { return listener.removed == 1; }));
    EXPECT_THROW(instrument.SetMeasureMode(1), DeviceDriverException);
}

TEST_P(OnKernel, GoesOnAfterAStall) {
    const PluggedInstrument plugged({"--faults", "bulk-in 0:stall"});
    PellandoFunctionality instrument(nullptr, 0);
    std::array<std::uint8_t, 256> buffer{};
    instrument.SetMeasureParameters(294, 0, 1, 6);
    EXPECT_THAT([&] { instrument.MeasureRequest(buffer.data(), 256, 1); },
                testing::ThrowsMessage<DeviceDriverException>(
                    testing::HasSubstr(GetParam() ? "0xE0000030" : "(Win32 Error (31) : ")));
    EXPECT_NO_THROW(instrument.MeasureRequest(buffer.data(), 256, 1)) << "the halt is cleared";
}

/// A driver of the kernel that takes the interface of every instrument, for the object's life.
class KernelDriver final {
  public:
    KernelDriver() {
        EXPECT_EQ(std::system("insmod /lib/modules/usbtest.ko vendor=0x1209 product=0x0001"), 0);
    }
    ~KernelDriver() { EXPECT_EQ(std::system("rmmod usbtest"), 0); }
    KernelDriver(const KernelDriver&) = delete;
    KernelDriver& operator=(const KernelDriver&) = delete;
};

/// What drives the interface of the instrument, as the kernel names it.
std::string InterfaceDriver() {
    const auto devices = Platform::Usb::ListRegisteredDevices();
    return devices.empty() ? "" : devices.front().kernelDriver;
}

TEST_P(OnKernel, TakesTheInterfaceFromAKernelDriverAndGivesItBack) {
    const KernelDriver driver;
    const PluggedInstrument plugged({});
    ASSERT_TRUE(WaitFor([] { return InterfaceDriver() == "usbtest"; })) << InterfaceDriver();
    // The simulator itself, which the kernel uses, is a finding of its own.
    (void)!std::system("./ostra doctor > doctor.txt 2> /dev/null");
    EXPECT_THAT(ReadText("doctor.txt"),
                testing::MatchesRegex("note: usb-.*kernel driver usbtest holds its interface; it gives way.*"
                                      "good: usb-.*answers \\(firmware.*"));
    EXPECT_EQ(InterfaceDriver(), "usbtest") << "the doctor has opened the instrument and closed it";
    {
        PellandoFunctionality instrument(nullptr, 0);
        EXPECT_EQ(InterfaceDriver(), "usbfs");
        EXPECT_NO_THROW(instrument.SetMeasureMode(1));
    }
    EXPECT_EQ(InterfaceDriver(), "usbtest");
}

/// Unplugs at every so many transfers of a readout, an image write and a scan: each time the host is told, in
/// time, and the instrument works when it is back.
TEST_P(OnKernel, UnplugsAtTransferAfterTransfer) {
    struct Transfers {
        const char* endpoint;  // not the button's, whose transfers come when they like
        int count;
    };
    struct Job {
        const char* name;
        std::array<Transfers, 2> transfers;
        std::vector<std::string> arguments;
        std::function<bool()> succeeds;
    };
    const auto withoutException = [](const std::function<void()>& work) {
        return [work] {
            try {
                work();
                return true;
            } catch (const DeviceDriverException& exception) {
                EXPECT_STRNE(exception.what(), "");
                return false;
            }
        };
    };
    const auto writesImage = [] {
        const int result = f3355d91d5df0e0b(CountingImage().data(), "");
        EXPECT_TRUE(result == OSTRA_OK || result == OSTRA_UNKNOWN_FAILURE) << result;
        return result == OSTRA_OK;
    };
    const std::vector<Job> jobs{
        {"readout", {{{"control", 2}, {"bulk-in", 1}}}, {}, withoutException([] {
             PellandoFunctionality instrument(nullptr, 0);
             std::array<std::uint8_t, 256> buffer{};
             instrument.SetMeasureParameters(294, 0, 1, 6);
             instrument.MeasureRequest(buffer.data(), 256, 1);
         })},
        {"image write", {{{"control", 32}, {"bulk-out", 96}}}, {}, writesImage},
        {"scan", {{{"control", 1}, {"bulk-in", 4}}}, {"--scan-bytes", "300000"}, withoutException([] {
             PellandoFunctionality(nullptr, 0).StartScan(1000, 2, 300000);
         })},
    };
    // From which unplug of the plan on, and how many of them on each transport.
    int first = -1;
    int count = 0;
    std::ifstream("/root/unplugs") >> first >> count;
    ASSERT_GE(first, 0);
    ASSERT_GT(count, 0);
    constexpr std::array kinds{"gone-before", "gone-during", "gone-after"};
    constexpr std::size_t goneAfter = 2;
    for (int round = first; round < first + count; ++round) {
        const Job& job = jobs[static_cast<std::size_t>(round) % jobs.size()];
        const auto& [before, behind] = job.transfers;
        const int transfers = before.count + behind.count;
        const int turn = round / static_cast<int>(jobs.size());
        const int transfer = turn * 7 % transfers;
        const auto kind = static_cast<std::size_t>(turn + turn / transfers) % kinds.size();
        const std::string plan =
            (transfer < before.count ? before.endpoint + (" " + std::to_string(transfer))
                                     : behind.endpoint + (" " + std::to_string(transfer - before.count))) +
            ":" + kinds[kind];
        SCOPED_TRACE(std::string(job.name) + ", " + plan);
        std::vector<std::string> arguments = job.arguments;
        arguments.insert(arguments.end(), {"--faults", plan});
        {
            const PluggedInstrument plugged(arguments);
            const auto start = steady_clock::now();
            const bool succeeded = job.succeeds();
            EXPECT_LT(steady_clock::now() - start, std::chrono::seconds(20));
            // Behind its last transfer a job has succeeded.
            EXPECT_TRUE(!succeeded || (kind == goneAfter && transfer == transfers - 1));
            EXPECT_TRUE(WaitFor([] { return !AnyPluggedIn(); })) << "it was not pulled out";
        }
        if (HasFailure()) {
            return;
        }
        if (const int done = round + 1 - first; done % 50 == 0 || done == count) {
            std::printf("%d of %d unplugs, from %d on\n", done, count, first);
            std::fflush(stdout);
        }
    }
    const PluggedInstrument plugged({});
    std::array<std::int32_t, OSTRA_READOUT_VALUES> values{};
    EXPECT_EQ(d4fb86cecc88582a(values.data(), ""), OSTRA_OK) << LastError();
}

}  // namespace
}  // namespace Varnholt::Tests
