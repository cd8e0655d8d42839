#include <atomic>

#include "DeviceDriver/Ostra/LowLevel/Win32/InterruptListener.h"
#include "DeviceDriver/Ostra/LowLevel/Win64/InterruptListener_Win64.h"
#include "Protocol/Instrument.h"
#include "Protocol/NativeDriver.h"
#include "Support/DriverTest.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using namespace DeviceDriver::Generic;
using namespace DeviceDriver::Ostra::LowLevel;
using Codes = std::vector<std::uint32_t>;
using UsbIoPipe = Varnholt::Utilities::Tools::SmartPointer<UsbIo::CUsbIoPipe>;

constexpr std::uint32_t Button = MessageButtonData;
const Answer Press{.data = {1}, .after = 5};
const Answer PressTooLate{.data = {1}, .after = Never, .cancelledWithData = true};
const Answer Silence{.after = Never};
const Answer Gone{.code = Errors::DeviceNotConnected, .after = 5};

struct OverNative {
    using Listener = InterruptListener;
    static constexpr bool IsUsbIo = false;
    static constexpr std::uint32_t Place = Protocol::NativeDriver::InterruptPipe;
    static std::unique_ptr<Listener> Make(const UsbIoPipe&) { return std::make_unique<Listener>("native/1"); }
    static std::shared_ptr<EventListener> Receiver(EventListener& receiver) {
        return {std::shared_ptr<void>(), &receiver};
    }
};

struct OverUsbIo {
    using Listener = InterruptListener_Win64;
    static constexpr bool IsUsbIo = true;
    static constexpr std::uint32_t Place = Protocol::InterruptInEndpoint;
    static std::unique_ptr<Listener> Make(const UsbIoPipe& pipe) {
        auto listener = std::make_unique<Listener>("not used");
        listener->SetPipe(pipe);
        return listener;
    }
    static EventListener* Receiver(EventListener& receiver) { return &receiver; }
};

template <class Transport>
class InterruptListeners : public DriverTest {
  protected:
    static constexpr std::uint32_t Place = Transport::Place;

    InterruptListeners() { EXPECT_EQ(pipe_->Bind(0, Protocol::InterruptInEndpoint, nullptr, nullptr), 0U); }

    /// The answers to the reads that count.
    void Script(const std::vector<Answer>& answers) {
        driver_.DropScript(Place);
        if (Transport::IsUsbIo) {
            driver_.Script(Place, Silence);  // to the one for what is left from before
        }
        for (const Answer& answer : answers) {
            driver_.Script(Place, answer);
        }
    }
    void Start() {
        listener_->SetListener(Transport::Receiver(receiver_));
        listener_->Start();
    }
    void StopWithin(std::uint64_t milliseconds) {
        const Stopwatch watch(clock_);
        listener_->Stop();
        watch.ExpectAtMost(milliseconds);
    }

    UsbIoPipe pipe_{new UsbIo::CUsbIoPipe};
    RecordingListener receiver_;
    std::unique_ptr<typename Transport::Listener> listener_ = Transport::Make(pipe_);
};
using BothTransports = testing::Types<OverNative, OverUsbIo>;
TYPED_TEST_SUITE(InterruptListeners, BothTransports);

TYPED_TEST(InterruptListeners, TurnReadsIntoMessages) {
    enum On { Both, Native, UsbIo };
    const std::uint32_t late = this->clock_.IsVirtual() ? 15'000 : 100;
    const std::vector<std::tuple<const char*, On, std::vector<Answer>, Codes, bool>> cases{
        {"refused", Both, {{.refusal = Errors::AccessDenied}}, {MessageDeviceGone}, false},
        {"pressed twice", Both, {Press, Press, Gone}, {Button, Button, MessageDeviceGone}, true},
        {"nothing", Native, {{.after = 5}}, {MessageDeviceGone}, false},
        {"nothing", UsbIo, {{.after = 5}, Gone}, {Button, MessageDeviceGone}, true},
        {"pressed late", Native, {{.data = {1}, .after = late}, Gone}, {Button, MessageDeviceGone}, true},
        {"pressed late", UsbIo, {Silence, Press, Gone}, {Button, MessageDeviceGone}, true},
        {"pressed as given up", UsbIo, {PressTooLate, Gone}, {Button, MessageDeviceGone}, true},
    };
    for (const auto& [name, on, reads, expected, touched] : cases) {
        if (on != Both && on != (TypeParam::IsUsbIo ? UsbIo : Native)) {
            continue;
        }
        SCOPED_TRACE(name);
        RecordingListener messages;
        this->Script(reads);
        const auto watching = TypeParam::Make(this->pipe_);
        watching->SetListener(TypeParam::Receiver(messages));
        EXPECT_FALSE(watching->IsTouched());
        watching->Start();
        WaitUntil([&] { return messages.Codes().size() >= expected.size(); });
        watching->Stop();  // the thread has ended by itself
        EXPECT_EQ(messages.Codes(), expected);
        EXPECT_EQ(watching->IsTouched(), touched);
        EXPECT_EQ(this->driver_.Running(this->Place), 0U);
    }
}

TYPED_TEST(InterruptListeners, CountWhatArrivesAsTheyStop) {
    std::atomic<bool> begun = false;
    Answer late = PressTooLate;
    late.onStart = [&] { begun = true; };
    this->Script({late});
    this->Start();
    WaitUntil([&] { return begun && this->driver_.Running(this->Place) == 1; });
    this->StopWithin(1);
    EXPECT_TRUE(this->listener_->IsTouched());
    EXPECT_THAT(this->receiver_.Codes(), ElementsAre(Button));
}

TYPED_TEST(InterruptListeners, NeedTheirEvents) {
    for (const int event : {1, 2}) {
        FailCalls("MakeAutoResetEvent", Errors::NoSystemResources, event);
        ExpectThrow<IOException>(
            std::string("could not create interrupt listener ") + (TypeParam::IsUsbIo ? "thread" : "events"),
            [this] { TypeParam::Make(this->pipe_)->Start(); });
        InstallCallFilter({});
    }
}

TYPED_TEST(InterruptListeners, StopFromInsideAMessage) {
    const OwnedHandle stopped(MakeAutoResetEvent()), release(MakeAutoResetEvent());
    this->Script({Press});
    this->receiver_.onMessage = [&](std::uint32_t) {
        EXPECT_TRUE(this->listener_->IsTouched());
        this->StopWithin(0);
        SignalAndWait(stopped.Get(), release.Get(), Infinite);
    };
    this->Start();
    EXPECT_EQ(Wait(stopped.Get(), 10'000), WaitResult::Signalled);
    const Stopwatch watch(this->clock_);
    this->listener_.reset();
    watch.ExpectAtMost(0);  // the thread is nobody's any more
    SignalEvent(release.Get());
    SleepMilliseconds(100);
    EXPECT_THAT(this->receiver_.Codes(), ElementsAre(Button));
    EXPECT_EQ(this->driver_.Running(this->Place), 0U);
    this->pipe_ = {};
    EXPECT_EQ(this->driver_.OpenFiles(), 0U) << "nobody keeps the pipe";
}

/// The thread comes back when nobody waits for it any more, and must find its things in place.
TYPED_TEST(InterruptListeners, AreNotHeldUpByAReceiverOrADriverThatDoesNotReturn) {
    const OwnedHandle held(MakeAutoResetEvent()), release(MakeAutoResetEvent());
    const auto hold = [&] { SignalAndWait(held.Get(), release.Get(), Infinite); };
    for (const bool byDriver : {false, true}) {
        RecordingListener receiver;
        receiver.onMessage = [&](std::uint32_t) { hold(); };
        const UsbIoPipe pipe(new UsbIo::CUsbIoPipe);
        EXPECT_EQ(pipe->Bind(0, Protocol::InterruptInEndpoint, nullptr, nullptr), 0U);
        const auto listener = TypeParam::Make(pipe);
        this->Script({byDriver ? Answer{.data = {1}, .onStart = hold} : Press});
        listener->SetListener(TypeParam::Receiver(receiver));
        listener->Start();
        EXPECT_EQ(Wait(held.Get(), 10'000), WaitResult::Signalled);
        const Stopwatch watch(this->clock_);
        listener->Stop();
        watch.ExpectAtMost(11'000);
        EXPECT_FALSE(TypeParam::IsUsbIo && pipe->IsOpen());
        SignalEvent(release.Get());
        SleepMilliseconds(10);
        EXPECT_EQ(receiver.Codes().size(), byDriver ? 0U : 1U) << "what comes behind the end is no news";
        // Nobody holds it up any more, even where the thread was ended by force.
        listener->ClearListener();
    }
}

TYPED_TEST(InterruptListeners, WorkOnTheCallersThreadToo) {
    this->Script({Press, Gone});
    this->listener_->SetListener(TypeParam::Receiver(this->receiver_));
    this->listener_->Listen();
    this->listener_->DispatchEvent(1);
    this->listener_->DispatchEvent(0);
    EXPECT_THAT(this->receiver_.Codes(), ElementsAre(Button, Button))
        << "nothing was started whose end would be news";
}

using NativeInterruptListener = InterruptListeners<OverNative>;
const std::string InterruptPath = "native/1\\PIPE03";

TEST_F(NativeInterruptListener, IsBoundedWhateverHoldsUpTheOpeningOfThePipe) {
    // Too late, it is closed unread. If it hangs, the thread is left to itself, or ended by force where that
    // can be.
    for (const auto& [opensAfter, startAndEnd] : {std::pair{3500U, 3500U}, {15'000U, 2000U + 11'000U}}) {
        SCOPED_TRACE(opensAfter);
        ScriptedDriver slow;
        const ScopedDeviceFiles inForce(slow);
        slow.OnOpen(InterruptPath, [opensAfter = opensAfter] {
            SleepMilliseconds(opensAfter);
            return Errors::Success;
        });
        const Stopwatch watch(clock_);
        {
            InterruptListener other("native/1");
            ExpectThrow<IOException>("interrupt listener thread had timeout", [&] { other.Start(); });
            watch.Expect(2000);
        }
        watch.Expect(startAndEnd);
        SleepMilliseconds(3000);
        const Lines transcript = slow.TakeTranscript();
        if (opensAfter < startAndEnd || clock_.IsVirtual()) {
            EXPECT_THAT(transcript, ElementsAre("open " + InterruptPath, "close " + InterruptPath));
        }
    }
}

TEST_F(NativeInterruptListener, EndsAReadThatCannotBeCancelledWithItsPipe) {
    Script({{.after = Never, .cancelledAfter = Never}});
    Start();
    WaitUntil([this] { return driver_.Running(Place) == 1; });
    const Stopwatch watch(clock_);
    listener_->Stop();
    watch.ExpectBetween(10'000, 11'000);
    EXPECT_EQ(driver_.Running(), 0U);
    EXPECT_THAT(driver_.TakeTranscript(), testing::Contains("close " + InterruptPath));
    EXPECT_THAT(receiver_.Codes(), IsEmpty());
}

using UsbIoInterruptListener = InterruptListeners<OverUsbIo>;

TEST_F(UsbIoInterruptListener, ReadsForTenMillisecondsAndThenForASecondEach) {
    std::vector<std::uint64_t> starts;
    for (int i = 0; i < 4; ++i) {
        driver_.Script(Place, {.after = Never, .onStart = [&] { starts.push_back(ClockScheduler().Now()); }});
    }
    Start();
    SleepMilliseconds(2500);
    StopWithin(1);
    ASSERT_EQ(starts.size(), 4U);
    for (std::size_t i = 0; i < 3; ++i) {
        EXPECT_NEAR(static_cast<double>(starts[i + 1] - starts[i]) / 1000, i == 0 ? 10 : 1000,
                    clock_.IsVirtual() ? 0 : 150);
    }
    EXPECT_THAT(receiver_.Codes(), IsEmpty());
}

TEST_F(UsbIoInterruptListener, TakesItsReceiverAwayOnlyAfterTheMessageUnderWay) {
    std::atomic<bool> inMessage = false;
    receiver_.onMessage = [&](std::uint32_t) {
        inMessage = true;
        SleepMilliseconds(100);
        inMessage = false;
    };
    Script({Press});
    Start();
    WaitUntil([this] { return !receiver_.Codes().empty(); });
    listener_->ClearListener();
    EXPECT_FALSE(inMessage);
    listener_->Stop();
}

}  // namespace
}  // namespace Varnholt::Tests
