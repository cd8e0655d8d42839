#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <mutex>

#include "DeviceDriver/Ostra/LowLevel/Win64/InterruptListener_Win64.h"
#include "Platform/CallFilter.h"
#include "Platform/Threads.h"
#include "Protocol/Instrument.h"
#include "UsbIoTransportFixture.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Protocol::UsbIoDriver;
using Generic::MessageButtonData;
using Generic::MessageDeviceGone;
using Generic::Utilities::IOException;
using Protocol::InterruptInEndpoint;
using testing::ElementsAre;
using testing::IsEmpty;
using Tests::TextOf;
using Tests::UsbIoAnswer;
using UsbIo::CUsbIoPipe;
using Varnholt::Utilities::Tools::SmartPointer;

constexpr std::uint32_t Never = UsbIoAnswer::Never;
constexpr std::uint32_t Limit = 20000;

class Receiver final : public Generic::EventListener {
  public:
    void MessageFromDevice(std::uint32_t code, std::uint32_t parameter) override {
        EXPECT_EQ(parameter, 0U);
        {
            const std::lock_guard held(lock);
            codes.push_back(code);
        }
        Platform::SignalEvent(arrived.Get());
        if (onMessage) {
            onMessage();
        }
    }
    bool WaitForMessage() { return Platform::Wait(arrived.Get(), Limit) == Platform::WaitResult::Signalled; }
    std::vector<std::uint32_t> Codes() {
        const std::lock_guard held(lock);
        return codes;
    }

    std::function<void()> onMessage;  ///< on the listener's thread

  private:
    Platform::OwnedHandle arrived{Platform::MakeAutoResetEvent()};
    std::mutex lock;
    std::vector<std::uint32_t> codes;
};

class InterruptListener_Win64Test : public testing::Test {
  protected:
    void SetUp() override {
        ASSERT_EQ(pipe->Bind(0, InterruptInEndpoint, nullptr, nullptr), Status::Success);
        listener.SetPipe(pipe);
        listener.SetListener(&receiver);
    }
    /// The read that throws away what is left from before, and finds nothing.
    void ScriptStaleRead() { driver.Script(InterruptInEndpoint, {.after = Never}); }
    void WaitForRead() {
        while (driver.Running(InterruptInEndpoint) == 0) {
            Platform::SleepMilliseconds(1);
        }
    }
    /// Until the listener has begun that many reads in all.
    void WaitForReads(std::size_t count) {
        for (std::size_t begun = 0; begun < count; Platform::SleepMilliseconds(1)) {
            for (const std::string& line : driver.TakeTranscript()) {
                begun += line.rfind("read", 0) == 0;
            }
        }
    }
    /// Milliseconds.
    std::uint64_t TimeOfStop(InterruptListener_Win64& stopped) const {
        const Tests::Stopwatch stopwatch(clock);
        stopped.Stop();
        return stopwatch.Milliseconds();
    }

    Tests::TestClock clock{Tests::TestTime::RealForThreadSanitizer};
    Tests::ScriptedUsbIo driver;
    Platform::ScopedDeviceFiles files{driver};
    Receiver receiver;
    SmartPointer<CUsbIoPipe> pipe{new CUsbIoPipe};
    InterruptListener_Win64 listener{"not used"};
};

TEST_F(InterruptListener_Win64Test, ReadsTurnIntoMessages) {
    struct Case {
        const char* name;
        std::vector<UsbIoAnswer> reads;  ///< from the first one on that counts
        std::vector<std::uint32_t> messages;
        bool touched;
    };
    const UsbIoAnswer press{.data = {1}, .after = 5};
    const UsbIoAnswer gone{.code = Status::DeviceGone, .after = 5};
    const UsbIoAnswer silence{.after = Never};
    const std::vector<Case> cases{
        {"gone", {gone}, {MessageDeviceGone}, false},
        {"gone at once", {{.code = Status::DeviceGone}}, {MessageDeviceGone}, false},
        {"pressed twice",
         {press, press, gone},
         {MessageButtonData, MessageButtonData, MessageDeviceGone},
         true},
        {"silent, then pressed", {silence, press, gone}, {MessageButtonData, MessageDeviceGone}, true},
        {"pressed as the read was given up",
         {{.data = {1}, .after = Never, .cancelledWithData = true}, gone},
         {MessageButtonData, MessageDeviceGone},
         true},
        {"an empty packet", {{.after = 5}, gone}, {MessageButtonData, MessageDeviceGone}, true},
    };
    for (const Case& row : cases) {
        Receiver own;
        InterruptListener_Win64 watching("not used");
        watching.SetPipe(pipe);
        watching.SetListener(&own);
        ScriptStaleRead();
        for (const UsbIoAnswer& read : row.reads) {
            driver.Script(InterruptInEndpoint, read);
        }
        watching.Start();
        for (std::size_t i = 0; i < row.messages.size() && own.Codes().size() < row.messages.size(); ++i) {
            EXPECT_TRUE(own.WaitForMessage()) << row.name;
        }
        watching.Stop();
        EXPECT_EQ(own.Codes(), row.messages) << row.name;
        EXPECT_EQ(watching.IsTouched(), row.touched) << row.name;
        EXPECT_EQ(driver.Running(InterruptInEndpoint), 0U) << row.name;
    }
}

TEST_F(InterruptListener_Win64Test, AnInterruptFromBeforeIsThrownAway) {
    driver.Script(InterruptInEndpoint, {.data = {1}, .after = 1});
    listener.Start();
    WaitForReads(2);
    listener.Stop();
    EXPECT_THAT(receiver.Codes(), IsEmpty());
    EXPECT_FALSE(listener.IsTouched());
}

TEST_F(InterruptListener_Win64Test, StopsAtOnceInEveryPlace) {
    EXPECT_EQ(TimeOfStop(listener), 0U) << "never started";
    listener.Start();
    WaitForRead();
    EXPECT_LT(TimeOfStop(listener), 100U);
    EXPECT_THAT(receiver.Codes(), IsEmpty());
    EXPECT_EQ(driver.Running(InterruptInEndpoint), 0U);

    // In every wait of its life: in the first read, in a later one, between two.
    for (std::uint32_t i = 0; i < 30; ++i) {
        InterruptListener_Win64 early("not used");
        early.SetPipe(pipe);
        early.SetListener(&receiver);
        early.Start();
        Platform::SleepMilliseconds(i);
        EXPECT_LT(TimeOfStop(early), 100U) << i;
    }
    EXPECT_THAT(receiver.Codes(), IsEmpty());
}

TEST_F(InterruptListener_Win64Test, AFailureDuringTheStopIsNoMessage) {
    const Platform::OwnedHandle inRead(Platform::MakeAutoResetEvent());
    ScriptStaleRead();
    driver.Script(InterruptInEndpoint, {.code = Status::DeviceGone, .refused = true, .onStart = [&] {
                                            Platform::SignalEvent(inRead.Get());
                                            Platform::SleepMilliseconds(50);
                                        }});
    listener.Start();
    ASSERT_EQ(Platform::Wait(inRead.Get(), Limit), Platform::WaitResult::Signalled);
    listener.Stop();
    EXPECT_THAT(receiver.Codes(), IsEmpty());
}

TEST_F(InterruptListener_Win64Test, TheReceiverCanBeTakenAwayFromInsideAMessage) {
    ScriptStaleRead();
    driver.Script(InterruptInEndpoint, {.data = {1}, .after = 1});
    driver.Script(InterruptInEndpoint, {.data = {1}, .after = 1});
    receiver.onMessage = [this] { listener.ClearListener(); };
    listener.Start();
    ASSERT_TRUE(receiver.WaitForMessage());
    WaitForRead();
    listener.Stop();
    EXPECT_THAT(receiver.Codes(), ElementsAre(MessageButtonData));
}

TEST_F(InterruptListener_Win64Test, NoMessageIsUnderWayOnceTheReceiverIsTakenAway) {
    std::atomic<bool> inMessage = false;
    receiver.onMessage = [&] {
        inMessage = true;
        Platform::SleepMilliseconds(100);
        inMessage = false;
    };
    ScriptStaleRead();
    driver.Script(InterruptInEndpoint, {.data = {1}, .after = 1});
    listener.Start();
    ASSERT_TRUE(receiver.WaitForMessage());
    listener.ClearListener();
    EXPECT_FALSE(inMessage);
    listener.Stop();
}

TEST_F(InterruptListener_Win64Test, CanBeStoppedFromInsideAMessage) {
    ScriptStaleRead();
    driver.Script(InterruptInEndpoint, {.data = {1}, .after = 1});
    const Platform::OwnedHandle stopped(Platform::MakeAutoResetEvent());
    receiver.onMessage = [&] {
        listener.Stop();
        Platform::SignalEvent(stopped.Get());
    };
    listener.Start();
    EXPECT_EQ(Platform::Wait(stopped.Get(), 5000), Platform::WaitResult::Signalled);
    listener.ClearListener();
}

TEST_F(InterruptListener_Win64Test, AReceiverThatDoesNotReturnDoesNotHoldUpTheStopForEver) {
    const Platform::OwnedHandle release(Platform::MakeAutoResetEvent());
    receiver.onMessage = [&] { Platform::Wait(release.Get(), Platform::Infinite); };
    ScriptStaleRead();
    driver.Script(InterruptInEndpoint, {.data = {1}, .after = 1});
    listener.Start();
    ASSERT_TRUE(receiver.WaitForMessage());
    EXPECT_LE(TimeOfStop(listener), 11500U);
    EXPECT_FALSE(pipe->IsOpen());
    Platform::SignalEvent(release.Get());
    listener.ClearListener();  // waits for the message where the platform could not end the thread
}

TEST_F(InterruptListener_Win64Test, SaysWhenTheThreadCannotBeMade) {
    Platform::InstallCallFilter([](std::string_view call) {
        return call == "StartThread" ? Platform::Errors::NoSystemResources : 0;
    });
    EXPECT_EQ(TextOf<IOException>([this] { listener.Start(); }),
              "could not create interrupt listener thread");
    Platform::InstallCallFilter({});
    listener.Stop();
}

TEST(InterruptListener_Win64Race, NoInterruptIsLostOrCountedTwice) {
    // Interrupts about the time when a read is given up, bytes that a cancelled read has moved all the same,
    // and a stop in the middle of it.
    for (std::uint64_t seed = 1; seed <= Tests::TestClock::SeedsToTry; ++seed) {
        const Tests::TestClock clock(Tests::TestTime::RealForThreadSanitizer, seed);
        Tests::ScriptedUsbIo driver;
        const Platform::ScopedDeviceFiles files(driver);
        const SmartPointer<CUsbIoPipe> pipe(new CUsbIoPipe);
        ASSERT_EQ(pipe->Bind(0, InterruptInEndpoint, nullptr, nullptr), Status::Success);
        driver.Script(InterruptInEndpoint, {.after = Never});  // what is left from before
        for (std::uint32_t i = 0; i < 40; ++i) {
            driver.Script(InterruptInEndpoint, {.data = {1},
                                                .after = 998 + i % 5,
                                                .cancelledAfter = i % 4,
                                                .cancelledWithData = i % 3 == 0});
        }
        Receiver receiver;
        InterruptListener_Win64 listener("not used");
        listener.SetPipe(pipe);
        listener.SetListener(&receiver);
        listener.Start();
        const auto presses = static_cast<std::size_t>(seed % 10);
        while (receiver.Codes().size() < presses) {
            ASSERT_TRUE(receiver.WaitForMessage());
        }
        Platform::SleepMilliseconds(993 + static_cast<std::uint32_t>(seed % 13));
        listener.Stop();
        EXPECT_THAT(receiver.Codes(), testing::Each(MessageButtonData));
        ASSERT_EQ(receiver.Codes().size(), driver.BytesIn(InterruptInEndpoint)) << seed;
        ASSERT_EQ(driver.Running(InterruptInEndpoint), 0U) << seed;
    }
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
