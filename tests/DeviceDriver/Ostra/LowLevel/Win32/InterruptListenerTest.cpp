#include <stdexcept>

#include "DeviceDriver/Ostra/LowLevel/Win32/InterruptListener.h"
#include "NativeTest.h"
#include "Platform/CallFilter.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Ostra::LowLevel::InterruptListener;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr std::uint32_t Button = 20011;
constexpr std::uint32_t Gone = 20010;
constexpr std::uint32_t InterruptPipe = 3;
const Answer ButtonData{.data = {1}};
const std::string InterruptPath = "native/1\\PIPE03";

class NativeInterruptListener : public NativeTest {
  protected:
    NativeInterruptListener() : NativeTest(TestTime::RealForThreadSanitizer) {}

    void StopWithin(std::uint64_t milliseconds) {
        const Stopwatch watch(clock);
        listener.Stop();
        watch.ExpectAtMost(milliseconds);
    }

    RecordingListener receiver;
    InterruptListener listener{"native/1"};
};

TEST_F(NativeInterruptListener, ReportsButtonDataAndRemembersThem) {
    driver.Script(InterruptPipe, {.data = Counting(8, 1), .after = 5});
    driver.Script(InterruptPipe, {.data = Counting(1, 1), .after = 5});
    listener.SetListener(&receiver);
    EXPECT_FALSE(listener.IsTouched());
    listener.Start();
    WaitUntil([&] { return receiver.Codes().size() == 2 && IsListening(); });
    EXPECT_TRUE(listener.IsTouched());
    EXPECT_THAT(receiver.Codes(), ElementsAre(Button, Button));

    listener.ClearListener();
    EXPECT_TRUE(driver.Complete(InterruptPipe, {.data = Counting(8, 1)}));
    WaitUntil([&] { return IsListening(); });
    StopWithin(10);
    EXPECT_TRUE(listener.IsTouched());
    EXPECT_THAT(receiver.Codes(), ElementsAre(Button, Button)) << "nothing after ClearListener, nor by Stop";
    EXPECT_EQ(driver.OpenFiles(), 0u);
}

TEST_F(NativeInterruptListener, ReportsTheEndOfThePipeOnce) {
    const struct {
        const char* name;
        Answer answer;
    } cases[] = {{"unplugged", {.code = Errors::DeviceNotConnected, .after = 5}},
                 {"nothing", {.after = 5}},
                 {"refused", {.refusal = Errors::AccessDenied}},
                 {"gone before the read", {.refusal = Errors::DeviceNotConnected}}};
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        RecordingListener messages;
        InterruptListener other("native/1");
        other.SetListener(&messages);
        driver.Script(InterruptPipe, row.answer);
        other.Start();
        WaitUntil([&] { return driver.OpenFiles() == 0; });  // the thread ends by itself
        EXPECT_THAT(messages.Codes(), ElementsAre(Gone));
        EXPECT_FALSE(other.IsTouched());
        other.Stop();
        EXPECT_THAT(messages.Codes(), ElementsAre(Gone));
    }
}

TEST_F(NativeInterruptListener, NeedsNobodyToReportTo) {
    driver.Script(InterruptPipe, {.data = Counting(1, 1), .after = 1});
    driver.Script(InterruptPipe, {.code = Errors::DeviceNotConnected, .after = 1});
    listener.Start();
    WaitUntil([&] { return driver.OpenFiles() == 0; });
    EXPECT_TRUE(listener.IsTouched());
}

TEST_F(NativeInterruptListener, EndsWithAReceiverThatThrows) {
    receiver.onMessage = [](std::uint32_t) { throw std::runtime_error("receiver"); };
    driver.Script(InterruptPipe, {.data = Counting(1, 1), .after = 1});
    listener.SetListener(&receiver);
    listener.Start();
    WaitUntil([&] { return driver.OpenFiles() == 0; });
    StopWithin(10);
}

TEST_F(NativeInterruptListener, WithoutThreadHasNothingToStop) {
    StopWithin(0);
}

/// Wherever its thread is just then: before, in or after the start of a read.
TEST_F(NativeInterruptListener, StopsAtOnce) {
    for (int round = 0; round < 100; ++round) {
        InterruptListener other("native/1");
        driver.Script(InterruptPipe, ButtonData);
        driver.Script(InterruptPipe, {.after = Never});
        other.Start();
        const Stopwatch watch(clock);
        other.Stop();
        watch.ExpectAtMost(1);
        EXPECT_EQ(driver.OpenFiles(), 0u);
        driver.DropScript(InterruptPipe);
    }
}

TEST_F(NativeInterruptListener, StopsFromInsideAMessage) {
    receiver.onMessage = [this](std::uint32_t) {
        EXPECT_TRUE(listener.IsTouched());
        StopWithin(10);
    };
    driver.Script(InterruptPipe, {.data = Counting(1, 1), .after = 1});
    listener.SetListener(&receiver);
    listener.Start();
    WaitUntil([&] { return driver.OpenFiles() == 0; });
    EXPECT_THAT(receiver.Codes(), ElementsAre(Button));
}

class NativeInterruptListenerFailure : public NativeTest {
  protected:
    static void StartFails(InterruptListener& listener, const char* text) {
        ExpectThrow<IOException>(text, [&] { listener.Start(); });
    }
    void FailCalls(std::string_view name) {
        InstallCallFilter([name](std::string_view call) {
            return call == name ? Errors::NoSystemResources : Errors::Success;
        });
    }
    void TearDown() override { InstallCallFilter({}); }
};

TEST_F(NativeInterruptListenerFailure, NoEvents) {
    FailCalls("MakeAutoResetEvent");
    ExpectThrow<IOException>("could not create interrupt listener events",
                             [] { const InterruptListener listener("native/1"); });
}

TEST_F(NativeInterruptListenerFailure, NoThread) {
    InterruptListener listener("native/1");
    FailCalls("StartThread");
    StartFails(listener, "could not create interrupt listener thread");
}

TEST_F(NativeInterruptListenerFailure, NoPipe) {
    driver.RefuseOpen(InterruptPath, Errors::FileNotFound);
    const Stopwatch watch(clock);
    {
        InterruptListener listener("native/1");
        StartFails(listener, "interrupt listener thread had timeout");
        watch.Expect(2000);
    }
    watch.Expect(2000);
}

TEST_F(NativeInterruptListenerFailure, PipeThatOpensTooLateIsClosedUnread) {
    driver.BeforeOpen(InterruptPath, [] { SleepMilliseconds(3500); });
    const Stopwatch watch(clock);
    {
        InterruptListener listener("native/1");
        StartFails(listener, "interrupt listener thread had timeout");
    }
    watch.Expect(3500);
    EXPECT_THAT(driver.TakeTranscript(), ElementsAre("open native/1\\PIPE03", "close native/1\\PIPE03"));
}

/// The thread comes back when nobody knows of it any more, and must find its things in place.
TEST_F(NativeInterruptListenerFailure, ThreadThatHangsIsLeftToItselfInTime) {
    driver.BeforeOpen(InterruptPath, [] { SleepMilliseconds(15'000); });
    const Stopwatch watch(clock);
    {
        InterruptListener listener("native/1");
        StartFails(listener, "interrupt listener thread had timeout");
    }
    watch.Expect(2000 + 11'000);
    SleepMilliseconds(3000);
#if defined(_WIN32)
    EXPECT_THAT(driver.TakeTranscript(), IsEmpty()) << "there a thread can be ended by force";
#else
    EXPECT_THAT(driver.TakeTranscript(), ElementsAre("open native/1\\PIPE03", "close native/1\\PIPE03"));
#endif
}

TEST_F(NativeInterruptListenerFailure, ReadThatCannotBeCancelledEndsWithThePipe) {
    driver.Script(InterruptPipe, {.after = Never, .cancelledAfter = Never});
    RecordingListener receiver;
    InterruptListener listener("native/1");
    listener.SetListener(&receiver);
    listener.Start();
    WaitUntil([&] { return IsListening(); });
    const Stopwatch watch(clock);
    listener.Stop();
    watch.ExpectBetween(10'000, 11'000);
    EXPECT_EQ(driver.OpenFiles(), 0u);
    EXPECT_EQ(driver.RunningTransfers(), 0u);
    EXPECT_THAT(receiver.Codes(), IsEmpty());
}

}  // namespace
}  // namespace Varnholt::Tests
