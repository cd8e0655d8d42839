#pragma once

#include <gmock/gmock.h>

#include "DeviceDriver/Generic/EventListener.h"
#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Platform/HostQueries.h"
#include "Platform/TestThread.h"
#include "Support/ExpectThrow.h"
#include "Support/FailCalls.h"
#include "Support/ScriptedDriver.h"
#include "Support/TestClock.h"
#include "Support/Transport.h"

namespace Varnholt::Tests {

using DeviceDriver::Generic::Utilities::DataException;
using DeviceDriver::Generic::Utilities::IOException;
using DeviceDriver::Generic::Utilities::TimeoutException;
using BackgroundThread = Platform::TestThread;
using Lines = std::vector<std::string>;
using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

inline std::string ErrorSuffix(Platform::ErrorCode code) {
    return " (Win32 Error (" + std::to_string(code) + ") : " + Platform::ErrorText(code) + ")";
}

/// The scripted driver as the device files in force.
class DriverTest : public testing::Test {
  protected:
    explicit DriverTest(TestTime time = TestTime::RealForThreadSanitizer,
                        std::vector<std::string> paths = {"native/1", "usbio/1"})
        : clock_(time), driver_(std::move(paths)) {}
    ~DriverTest() override {
        Platform::InstallCallFilter({});
        Platform::Override64BitHost(std::nullopt);
    }

    /// Without the reads of the interrupt listener over USBIO.
    static Lines WithoutListener(Lines lines) {
        std::erase_if(lines, [](const std::string& line) {
            return line.starts_with("read 84") || line.starts_with("cancel 84");
        });
        return lines;
    }

    TestClock clock_;  // before all that has to do with time
    ScriptedDriver driver_;
    Platform::ScopedDeviceFiles files_{driver_};
};

/// The same on a host with one of the transports.
class TransportTest : public DriverTest, public testing::WithParamInterface<Transport> {
  protected:
    TransportTest() : DriverTest(TestTime::RealForThreadSanitizer, Paths(2)) {
        Platform::Override64BitHost(!IsNative());
    }

    static bool IsNative() { return GetParam() == Transport::Native; }
    static Lines Paths(std::size_t count) {
        Lines paths;
        while (paths.size() < count) {
            paths.push_back(Name(GetParam()) + ("/" + std::to_string(paths.size() + 1)));
        }
        return paths;
    }
};

/// Lets other threads get on until `condition` holds; fails the test when that takes 20 seconds.
template <class Condition>
void WaitUntil(Condition condition) {
    const std::uint64_t end = Platform::ClockScheduler().Now() + 20'000'000;
    while (!condition()) {
        if (Platform::ClockScheduler().Now() > end) {
            ADD_FAILURE() << "waited in vain";
            return;
        }
        Platform::SleepMilliseconds(1);
    }
}

/// Notes messages; does what the test wants inside them.
class RecordingListener final : public DeviceDriver::Generic::EventListener {
  public:
    void MessageFromDevice(std::uint32_t code, std::uint32_t parameter) override {
        {
            const std::lock_guard held(lock_);
            codes_.push_back(code + parameter);
        }
        if (onMessage) {
            onMessage(code);
        }
    }
    std::vector<std::uint32_t> Codes() {
        const std::lock_guard held(lock_);
        return codes_;
    }

    std::function<void(std::uint32_t code)> onMessage;

  private:
    std::mutex lock_;
    std::vector<std::uint32_t> codes_;
};

}  // namespace Varnholt::Tests
