#include "DeviceDriver/Ostra/LowLevel/Win32/USBConnection.h"
#include "NativeTest.h"
#include "Platform/CallFilter.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Ostra::LowLevel::USBConnection;
using Protocol::NativeDriver::ControlBlock;
using testing::ElementsAre;

constexpr ControlBlock OutwardBlock{0, 2, 0, 0, 0xCA, 0, 0, 0, 0, 0};
constexpr std::uint32_t Control = Protocol::NativeDriver::ControlVendorRequest;

const std::string TimedOut = "Device IO control failed ";

class UsbConnection : public NativeTest {};

TEST_F(UsbConnection, ThatCannotBeMadeLeavesNothingOpen) {
    driver_.RefuseOpen("native/1\\PIPE01", Errors::AccessDenied);
    ExpectThrow<IOException>("could not open pipe:" + ErrorSuffix(Errors::AccessDenied),
                             [] { const USBConnection connection("native/1", 1, NoHandle); });

    InstallCallFilter([](std::string_view call) {
        return call == "MakeAutoResetEvent" ? Errors::NoSystemResources : Errors::Success;
    });
    ExpectThrow<IOException>("could not create pipe-event-handle",
                             [] { const USBConnection connection("native/1", 2, NoHandle); });
    InstallCallFilter({});
    EXPECT_EQ(driver_.OpenFiles(), 0u);
}

TEST_F(UsbConnection, ThatIsOpenedAnewLetsGoOfWhatWasOpen) {
    const OwnedHandle event(MakeAutoResetEvent());
    {
        USBConnection connection("native/1", 1, NoHandle);
        const Handle own = connection.CompletionEvent();
        EXPECT_NE(own, event.Get());
        connection.OpenConnection(event.Get());
        EXPECT_FALSE(SignalEvent(own)) << "closed with the connection";
        EXPECT_EQ(connection.CompletionEvent(), event.Get());
        EXPECT_EQ(driver_.OpenFiles(), 1u);
    }
    EXPECT_EQ(driver_.OpenFiles(), 0u);
    EXPECT_TRUE(SignalEvent(event.Get())) << "which is its owner's";
}

void Read64(USBConnection& connection) {
    const auto buffer = std::make_unique<std::uint8_t[]>(64);
    connection.Read(buffer.get(), 64, 64);
}

void Write64(USBConnection& connection) {
    const auto buffer = std::make_unique<std::uint8_t[]>(64);
    connection.Write(buffer.get(), 64, 640);
}

void SendControl(USBConnection& connection) {
    const auto data = std::make_unique<std::uint8_t[]>(8);
    connection.PerformDeviceIOControl(OutwardBlock, Control, data.get(), 8, true);
}

void AskControl(USBConnection& connection) {
    ControlBlock block = OutwardBlock;
    block[Protocol::NativeDriver::Block::Direction] = 1;
    const auto data = std::make_unique<std::uint8_t[]>(8);
    connection.PerformDeviceIOControl(block, Control, data.get(), 8, true);
}

struct TransferCase {
    const char* name;
    void (*operation)(USBConnection&);
    Answer answer;
    std::uint64_t milliseconds;  ///< until the operation returns
    std::string text = "";       ///< of the failure
};

/// Each buffer dies with its operation: a transfer that outlived it would write into freed memory.
TEST_F(UsbConnection, EndsEachTransferInTimeAndReportsIt) {
    const ErrorCode gone = Errors::DeviceNotConnected;
    const Answer silent{.after = Never}, stalled{.code = Errors::GeneralFailure, .after = 7},
        notStarted{.refusal = gone}, noWait{.after = Never, .completesThrough = NamesNothing()};
    const auto data = [](std::size_t count, std::uint32_t after = 0) {
        return Answer{.data = Counting(count, 1), .after = after};
    };
    Answer stalledWithData = stalled, overfull = data(64);
    stalledWithData.data = Counting(64, 1);
    overfull.count = 65;
    const auto cancelledSlowly = [](std::size_t count, ErrorCode with) {
        return Answer{.data = Counting(count, 1),
                      .after = Never,
                      .cancelledAfter = 40,
                      .cancelledWith = with,
                      .cancelledWithData = true};
    };
    const std::string failed = ErrorSuffix(Errors::GeneralFailure), isGone = ErrorSuffix(gone),
                      incomplete = ErrorSuffix(Errors::IoIncomplete),
                      noHandle = ErrorSuffix(Errors::InvalidHandle);
    const std::string pending = TimedOut + ErrorSuffix(Errors::IoPending);
    const std::string read = "read data failed", write = "write data failed", few = " (Not enough data)";
    const TransferCase cases[] = {
        {"control", SendControl, {}, 1},
        {"control, answered", AskControl, data(8), 1},
        {"control, shorter than asked", AskControl, data(3), 1},
        {"control, in the last moment", AskControl, data(8, 1999), 2000},
        {"control, stalled", SendControl, stalled, 8, "Device IO control failed: " + failed},
        {"control, gone at once", SendControl, {.code = gone}, 1, "Device IO control failed: " + isGone},
        {"control, silent", AskControl, silent, 2001, pending},
        {"control, slow", AskControl, cancelledSlowly(8, Errors::OperationAborted), 2041, pending},
        {"control, not started", SendControl, notStarted, 2001, TimedOut + isGone},
        {"control, wait impossible", SendControl, noWait, 1, TimedOut + noHandle},

        {"read", Read64, data(64, 10), 10},
        {"read, in the last moment", Read64, data(64, 5063), 5063},
        {"read, silent", Read64, silent, 5064, read + incomplete},
        {"read, slow", Read64, cancelledSlowly(64, Errors::Success), 5104, read + incomplete},
        {"read, stalled", Read64, stalled, 7, read + failed},
        {"read, stalled behind all data", Read64, stalledWithData, 7, read + failed},
        {"read, not started", Read64, notStarted, 5064, read + isGone},
        {"read, wait impossible", Read64, noWait, 0, read + incomplete},
        {"read, short", Read64, data(60), 0, read + few},
        {"read, empty", Read64, {}, 0, read + few},
        {"read, longer", Read64, overfull, 0, read + few},

        {"write", Write64, {.after = 10}, 10},
        {"write, silent", Write64, silent, 5640, write + incomplete},
        {"write, stalled", Write64, stalled, 7, write + failed},
        {"write, short", Write64, {.count = 63}, 0, write + few},
    };
    for (const TransferCase& row : cases) {
        SCOPED_TRACE(row.name);
        if (row.milliseconds > 1000 && row.text.empty() && !clock_.IsVirtual()) {
            continue;  // the last moment is a millisecond
        }
        const std::uint32_t pipe = row.operation == Read64 ? 1 : row.operation == Write64 ? 2 : 0;
        USBConnection connection("native/1", pipe, NoHandle);
        driver_.Script(pipe, row.answer);
        const Stopwatch watch(clock_);
        const auto operation = [&] { row.operation(connection); };
        if (row.text.empty()) {
            EXPECT_NO_THROW(operation());
        } else if (row.text.starts_with(TimedOut)) {
            ExpectThrow<TimeoutException>(row.text, operation);
        } else {
            ExpectThrow<IOException>(row.text, operation);
        }
        watch.Expect(row.milliseconds);
        EXPECT_EQ(driver_.RunningTransfers(), 0u);
    }
}

class UsbConnectionVectorRead : public NativeTest {
  protected:
    std::uint32_t Read(Answer answer) {
        driver_.Script(3, std::move(answer));
        return connection_.Read(buffer_, endRequested_);
    }

    std::atomic<bool> endRequested_ = false;
    OwnedHandle event_{MakeAutoResetEvent()};
    USBConnection connection_{"native/1", 3, event_.Get()};
    std::vector<std::uint8_t> buffer_ = Bytes(8);
};

TEST_F(UsbConnectionVectorRead, GivesWhatCame) {
    const std::uint32_t late = clock_.IsVirtual() ? 100'000 : 100;
    EXPECT_EQ(Read({.data = Counting(3, 1), .after = late}), 3u);
    EXPECT_THAT(buffer_, ElementsAre(1, 2, 3, 0, 0, 0, 0, 0));
    EXPECT_EQ(Read({.data = Counting(9, 1), .after = 1}), 8u);
    EXPECT_EQ(Read({.after = 5}), 0u);
    EXPECT_EQ(Read({.code = Errors::DeviceNotConnected, .after = 5}), 0u);
    EXPECT_EQ(Read({.refusal = Errors::AccessDenied}), 0u);
    EXPECT_EQ(Read({.refusal = Errors::DeviceNotConnected}), 0u) << "or it would wait for ever";
}

TEST_F(UsbConnectionVectorRead, EndsWhenSomebodySignalsItsEvent) {
    const auto signal = [this] { SignalEvent(event_.Get()); };
    ClockScheduler().CallAt(ClockScheduler().Now() + 100'000, signal);
    EXPECT_EQ(Read({.after = Never}), 0u);
    EXPECT_EQ(driver_.RunningTransfers(), 0u);

    ClockScheduler().CallAt(ClockScheduler().Now() + 100'000, signal);
    EXPECT_EQ(Read({.data = Counting(2, 1), .after = Never, .cancelledAfter = 3, .cancelledWithData = true}),
              2u)
        << "data that arrive during the cancellation count";
    EXPECT_THAT(driver_.TakeTransfers(), ElementsAre("read 3 [8]", "cancel 3", "read 3 [8]", "cancel 3"));
}

}  // namespace
}  // namespace Varnholt::Tests
