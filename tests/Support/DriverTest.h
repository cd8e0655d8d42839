#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "DeviceDriver/Generic/EventListener.h"
#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Platform/EventScheduler.h"
#include "Platform/TestThread.h"
#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"
#include "Support/ExpectThrow.h"
#include "Support/ScriptedDriver.h"
#include "Support/TestClock.h"

namespace Varnholt::Tests {

using DeviceDriver::Generic::Utilities::DataException;
using DeviceDriver::Generic::Utilities::IOException;
using DeviceDriver::Generic::Utilities::TimeoutException;
using BackgroundThread = Platform::TestThread;
using Lines = std::vector<std::string>;

/// The scripted driver as the device files in force.
class DriverTest : public testing::Test {
  protected:
    explicit DriverTest(TestTime time = TestTime::RealForThreadSanitizer,
                        std::vector<std::string> paths = {"native/1", "usbio/1"})
        : clock_(time), driver_(std::move(paths)) {}

    TestClock clock_;  // before all that has to do with time
    ScriptedDriver driver_;
    Platform::ScopedDeviceFiles files_{driver_};
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
