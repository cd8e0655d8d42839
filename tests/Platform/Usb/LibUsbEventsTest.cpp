#include <gtest/gtest.h>
#include <libusb-1.0/libusb.h>

#include <chrono>
#include <memory>
#include <thread>

#include "Platform/Threads.h"
#include "Platform/Usb/LibUsbEvents.h"
#include "Platform/WaitableObjects.h"
#include "Support/SignalMasks.h"

namespace Varnholt::Platform::Usb {
namespace {

constexpr std::uint32_t LongTimeout = 20'000;

/// Threads that wait with a libusb context to look after, without a device.
class LibUsbEventsTest : public testing::Test {
  protected:
    void SetUp() override {
        libusb_set_option(nullptr, LIBUSB_OPTION_NO_DEVICE_DISCOVERY);
        ASSERT_EQ(libusb_init(&context), LIBUSB_SUCCESS);
        events = std::make_shared<LibUsbEvents>(context);
    }
    void TearDown() override {
        Posix::WorkOffInWaits({});
        events.reset();
        libusb_exit(context);
    }

    static std::uint32_t Echo(void* test) {
        auto& self = *static_cast<LibUsbEventsTest*>(test);
        Posix::WorkOffInWaits(self.events);
        for (int i = 0; i < Rounds; ++i) {
            if (Wait(self.there.Get(), LongTimeout) != WaitResult::Signalled) {
                return 1;
            }
            SignalEvent(self.back.Get());
        }
        return 0;
    }

    static constexpr int Rounds = 2000;
    libusb_context* context = nullptr;
    std::shared_ptr<LibUsbEvents> events;
    const OwnedHandle there{MakeAutoResetEvent()};
    const OwnedHandle back{MakeAutoResetEvent()};
};

TEST_F(LibUsbEventsTest, ItsThreadTakesNoSignalOfTheHost) {
    Tests::ExpectOtherThreadsBlockHostSignals();
}

/// Each is in libusb, or about to go there, when the other wakes it.
TEST_F(LibUsbEventsTest, ThreadsThatWakeEachOtherLoseNoSignal) {
    const OwnedHandle echo(StartThread(&LibUsbEventsTest::Echo, this));
    Posix::WorkOffInWaits(events);
    for (int i = 0; i < Rounds; ++i) {
        SignalEvent(there.Get());
        ASSERT_EQ(Wait(back.Get(), LongTimeout), WaitResult::Signalled) << "round " << i;
    }
    EXPECT_EQ(Wait(echo.Get(), LongTimeout), WaitResult::Signalled);
}

TEST_F(LibUsbEventsTest, AWaitEndsInTimeAndOutlastsTheEvents) {
    Posix::WorkOffInWaits(events);
    EXPECT_EQ(Wait(back.Get(), 30), WaitResult::TimedOut);
    const OwnedHandle echo(StartThread(&LibUsbEventsTest::Echo, this));
    for (int i = 0; i < Rounds; ++i) {
        if (i == Rounds / 2) {
            events->HandleAlways();
        } else if (i == Rounds / 2 + 10) {
            events->Stop();
        }
        SignalEvent(there.Get());
        ASSERT_EQ(Wait(back.Get(), LongTimeout), WaitResult::Signalled) << "round " << i;
    }
    EXPECT_EQ(Wait(echo.Get(), LongTimeout), WaitResult::Signalled);
}

/// An aborted transfer, or the button's, may end when nobody waits.
TEST_F(LibUsbEventsTest, AfterALongWaitTheirOwnThreadHandlesThemAgain) {
    Posix::WorkOffInWaits(events);
    EXPECT_EQ(Wait(back.Get(), 50), WaitResult::TimedOut);
    const auto patienceEnds = std::chrono::steady_clock::now() + std::chrono::milliseconds(LongTimeout);
    while (libusb_event_handler_active(context) == 0 && std::chrono::steady_clock::now() < patienceEnds) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    EXPECT_NE(libusb_event_handler_active(context), 0);
}

}  // namespace
}  // namespace Varnholt::Platform::Usb
