#include <libusb-1.0/libusb.h>

#include "Platform/Usb/LibUsbEvents.h"
#include "Support/DriverTest.h"
#include "Support/SignalMasks.h"

namespace Varnholt::Platform::Usb {
namespace {

/// Threads that wait with a libusb context to look after, without a device.
class LibUsbEventsTest : public testing::Test {
  protected:
    void SetUp() override {
        libusb_set_option(nullptr, LIBUSB_OPTION_NO_DEVICE_DISCOVERY);
        ASSERT_EQ(libusb_init(&context_), LIBUSB_SUCCESS);
        events_ = std::make_shared<LibUsbEvents>(context_);
        for (const OwnedHandle* event : {&there_, &back_}) {
            ResetEvent(event->Get(), events_);
        }
    }
    void TearDown() override {
        events_.reset();
        libusb_exit(context_);
    }

    bool IsHandled() const { return libusb_event_handler_active(context_) != 0; }

    static constexpr int Rounds = 2000;
    libusb_context* context_ = nullptr;
    std::shared_ptr<LibUsbEvents> events_;
    const OwnedHandle there_{MakeAutoResetEvent()};
    const OwnedHandle back_{MakeAutoResetEvent()};
};

TEST_F(LibUsbEventsTest, ItsThreadTakesNoSignalOfTheHost) {
    Tests::ExpectOtherThreadsBlockHostSignals();
}

/// Each is in libusb, or about to go there, when the other wakes it.
TEST_F(LibUsbEventsTest, WaitsEndInTimeLoseNoSignalAndOutlastTheEvents) {
    const auto start = ClockScheduler().Now();
    EXPECT_EQ(Wait(back_.Get(), 30), WaitResult::TimedOut);
    EXPECT_LT(ClockScheduler().Now() - start, 1'000'000U);
    const TestThread echo([this] {
        for (int i = 0; i < Rounds && Wait(there_.Get(), LongTimeout) == WaitResult::Signalled; ++i) {
            SignalEvent(back_.Get());
        }
    });
    for (int i = 0; i < Rounds; ++i) {
        if (i == Rounds / 2) {
            events_->HandleAlways();
        } else if (i == Rounds / 2 + 10) {
            events_->Stop();
        }
        SignalEvent(there_.Get());
        ASSERT_EQ(Wait(back_.Get(), LongTimeout), WaitResult::Signalled) << "round " << i;
    }
}

/// An aborted transfer, or the button's, may end when nobody waits.
TEST_F(LibUsbEventsTest, OneThreadHandlesThemAndTheirOwnWhereNobodyWaits) {
    EXPECT_EQ(Wait(back_.Get(), 50), WaitResult::TimedOut);
    Tests::WaitUntil([this] { return IsHandled(); });
    for (int i = 0; i < 2; ++i) {
        EXPECT_TRUE(events_->TryBegin());
        EXPECT_FALSE(events_->TryBegin()) << "another waits with them";
        events_->HandleEvents(ClockScheduler().Now());
    }
    events_->HandleAlways();
    EXPECT_FALSE(events_->TryBegin());
    Tests::WaitUntil([this] { return IsHandled(); });
    events_->Stop();
    EXPECT_FALSE(events_->TryBegin());
    EXPECT_FALSE(IsHandled());

    LibUsbEvents patient(context_, std::chrono::hours(1));
    EXPECT_TRUE(patient.TryBegin());
    patient.HandleEvents(ClockScheduler().Now());
    Tests::WaitUntil([this] { return !IsHandled(); });
    patient.HandleNow();
    Tests::WaitUntil([this] { return IsHandled(); });
}

TEST_F(LibUsbEventsTest, TheirEndAwaitsNobodyWhoIsAboutToWait) {
    Tests::WaitUntil([this] { return IsHandled(); });
    ASSERT_TRUE(events_->TryBegin());
    const TestThread stopping([this] { events_->Stop(); });
    std::this_thread::sleep_for(std::chrono::milliseconds(50));  // their own thread takes the interruption
    const auto start = ClockScheduler().Now();
    events_->HandleEvents(start + 5'000'000U);
    EXPECT_LT(ClockScheduler().Now() - start, 1'000'000U);
}

}  // namespace
}  // namespace Varnholt::Platform::Usb
