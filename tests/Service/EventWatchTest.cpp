#include "Service/EventWatch.h"
#include "Service/InterruptibleDeviceFiles.h"
#include "Support/DriverTest.h"
#include "Support/SimulatedHost.h"

namespace Varnholt::Tests {
namespace {

using namespace Service;

class EventReaders : public testing::Test {
  protected:
    const TestClock clock_{TestTime::Virtual};
    SimulatedHost host_{Transport::Native};
    Simulator::SimulatedInstrument& simulated_ = host_.Add("one");
    InterruptibleDeviceFiles files_{Platform::DeviceFiles()};
    const Platform::ScopedDeviceFiles inForce_{files_};
    Observer nobody_;
    Interruption never_;
    Context context_{nobody_, never_, files_};
    EventMailbox mailbox_;
    OpenedInstrument instrument_{context_, FindInstrument(context_, ""), &mailbox_};
};

TEST_F(EventReaders, TakeWhatComesWhileTheyLive) {
    Platform::SleepMilliseconds(50);  // their time begins with them
    std::optional<EventReader> first(std::in_place, mailbox_, instrument_);
    first.emplace(mailbox_, instrument_);  // at the same place: what is left of the one before shows
    EventReader second(mailbox_, instrument_);
    Platform::SleepMilliseconds(100);
    simulated_.PressButton();
    const Stopwatch watch(clock_);
    for (EventReader* const reader : {&*first, &second}) {
        reader->Wait(1000);
        const auto event = reader->Next();
        ASSERT_TRUE(event);
        EXPECT_EQ(event->kind, EventKind::Button);
        EXPECT_NEAR(event->seconds, 0.1, clock_.IsVirtual() ? 1e-5 : 0.01);
        EXPECT_FALSE(reader->Next());
    }
    watch.ExpectAtMost(100);
}

/// Whatever has failed, it is looked whether an instrument whose transfer it was is still there.
TEST_F(EventReaders, AFailureNamesItsInstrumentAndWhetherThatHasGone) {
    const auto explain = [this](auto exception) {
        return std::string(context_.Explain(std::make_exception_ptr(exception), "native/gone").what());
    };
    EXPECT_EQ(explain(IOException("broken", "")), "native/gone: unplugged (a transfer failed (broken))");
    EXPECT_EQ(explain(TimeoutException("late", "")),
              "native/gone: unplugged (the instrument did not answer in time (late))");
    EXPECT_EQ(explain(DataException("odd", "")), "native/gone: odd");
}

TEST_F(EventReaders, TellARemovalFromMessagesThatEndForAnotherReason) {
    EventReader reader(mailbox_, instrument_);
    mailbox_.MessageFromDevice(DeviceDriver::Generic::MessageDeviceGone, 0);
    const Stopwatch watch(clock_);
    EXPECT_THROW(reader.Next(), Failure);
    watch.ExpectAtMost(1000);
    mailbox_.MessageFromDevice(DeviceDriver::Generic::MessageDeviceGone, 0);
    // A system may list it for a moment after it has gone.
    auto& scheduler = Platform::ClockScheduler();
    scheduler.CallAt(
        scheduler.Now() + 100'000, [this] { host_.Bus().Unplug("one"); }, this);
    const auto event = reader.Next();
    scheduler.Forget(this);
    ASSERT_TRUE(event);
    EXPECT_EQ(event->kind, EventKind::Removed);
}

}  // namespace
}  // namespace Varnholt::Tests
