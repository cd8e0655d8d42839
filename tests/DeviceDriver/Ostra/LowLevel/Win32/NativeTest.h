#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "DeviceDriver/Generic/EventListener.h"
#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Platform/DeviceFiles.h"
#include "Platform/ErrorCodes.h"
#include "Platform/EventScheduler.h"
#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"
#include "Protocol/NativeDriver.h"
#include "ScriptedDriver.h"
#include "Support/TestClock.h"

namespace Varnholt::Tests {

using DeviceDriver::Generic::Utilities::IOException;
using DeviceDriver::Generic::Utilities::TimeoutException;

inline std::string ErrorSuffix(Platform::ErrorCode code) {
    return " (Win32 Error (" + std::to_string(code) + ") : " + Platform::ErrorText(code) + ")";
}

/// Lets other threads get on until `condition` holds; fails the test when that takes 10 seconds.
template <class Condition>
void WaitUntil(Condition condition) {
    const std::uint64_t end = Platform::ClockScheduler().Now() + 10'000'000;
    while (!condition()) {
        if (Platform::ClockScheduler().Now() > end) {
            ADD_FAILURE() << "waited in vain";
            return;
        }
        Platform::SleepMilliseconds(1);
    }
}

template <class Expected>
void ExpectThrow(const std::string& text, const std::function<void()>& operation) {
    try {
        operation();
        ADD_FAILURE() << "nothing thrown, expected: " << text;
    } catch (const Expected& exception) {
        EXPECT_STREQ(exception.what(), text.c_str());
    } catch (const std::exception& other) {
        ADD_FAILURE() << "another class: " << other.what() << ", expected: " << text;
    }
}

/// A mutex whose owner has ended without releasing it; a wait on it reports that once.
class AbandonedMutex final {
  public:
    AbandonedMutex() : mutex(Platform::MakeMutex("")) {
        Platform::OwnedHandle owner(Platform::StartThread(
            [](void* taken) {
                Platform::Wait(taken, Platform::Infinite);
                return std::uint32_t{0};
            },
            mutex.Get()));
        Platform::Wait(owner.Get(), Platform::Infinite);
    }
    Platform::Handle Get() const { return mutex.Get(); }

  private:
    Platform::OwnedHandle mutex;
};

/// A handle that names nothing. (That of an object which is no more could come to name another.)
inline Platform::Handle NamesNothing() {
    static int object;
    return &object;
}

/// Runs a function on a thread of the platform; waits for its end.
class BackgroundThread final {
  public:
    explicit BackgroundThread(std::function<void()> entry) : body(std::move(entry)) {
        thread = Platform::OwnedHandle(Platform::StartThread(
            [](void* self) {
                static_cast<BackgroundThread*>(self)->body();
                return std::uint32_t{0};
            },
            this));
    }
    ~BackgroundThread() { Join(); }
    BackgroundThread(const BackgroundThread&) = delete;
    BackgroundThread& operator=(const BackgroundThread&) = delete;

    void Join() { Platform::Wait(thread.Get(), Platform::Infinite); }
    bool HasEnded() { return Platform::Wait(thread.Get(), 0) == Platform::WaitResult::Signalled; }

  private:
    const std::function<void()> body;
    Platform::OwnedHandle thread;
};

/// Notes messages; does what the test wants inside them.
class RecordingListener final : public DeviceDriver::Generic::EventListener {
  public:
    void MessageFromDevice(std::uint32_t code, std::uint32_t parameter) override {
        {
            const std::lock_guard held(lock);
            codes.push_back(code + parameter);
        }
        if (onMessage) {
            onMessage(code);
        }
    }
    std::vector<std::uint32_t> Codes() {
        const std::lock_guard held(lock);
        return codes;
    }

    std::function<void(std::uint32_t code)> onMessage;

  private:
    std::mutex lock;
    std::vector<std::uint32_t> codes;
};

/// The scripted driver as the device files in force.
class NativeTest : public testing::Test {
  protected:
    explicit NativeTest(TestTime time = TestTime::Virtual) : clock(time) {}

    TestClock clock;
    ScriptedDriver driver;
    Platform::ScopedDeviceFiles files{driver};

    /// The listener's thread waits for the instrument.
    bool IsListening() const { return driver.Running(Protocol::NativeDriver::InterruptPipe) == 1; }
};

}  // namespace Varnholt::Tests
