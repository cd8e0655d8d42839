#include <atomic>

#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/USBConnection.h"
#include "Protocol/NativeDriver.h"
#include "Support/DriverTest.h"
#include "Utilities/Multithreading/Mutex.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using namespace DeviceDriver::Generic;
using namespace DeviceDriver::Ostra::LowLevel;
using Protocol::NativeDriver::ControlBlock;
using Protocol::NativeDriver::InterruptPipe;
using namespace Varnholt::Utilities::Multithreading;

const Answer ButtonData{.data = {1}};
const std::string Path = "native/1";

class UsbConnection : public DriverTest {
  protected:
    UsbConnection() : DriverTest(TestTime::Virtual) {}
};

TEST_F(UsbConnection, LeavesNothingOpenOfWhatItCannotMakeOrOpensAnew) {
    FailCalls("MakeAutoResetEvent");
    ExpectThrow<IOException>("could not create pipe-event-handle",
                             [] { const USBConnection connection(Path, 2, NoHandle); });
    InstallCallFilter({});
    EXPECT_EQ(driver_.OpenFiles(), 0u);

    const OwnedHandle event(MakeAutoResetEvent());
    {
        USBConnection connection(Path, 2, NoHandle);
        const Handle own = connection.CompletionEvent();
        connection.OpenConnection(event.Get());
        EXPECT_FALSE(SignalEvent(own)) << "closed with the connection";
        EXPECT_EQ(connection.CompletionEvent(), event.Get());
        EXPECT_EQ(driver_.OpenFiles(), 1u);
    }
    EXPECT_EQ(driver_.OpenFiles(), 0u);
    EXPECT_TRUE(SignalEvent(event.Get())) << "which is its owner's";
}

/// The buffer dies with its operation: a transfer that outlived it would write into freed memory.
void Transfer(USBConnection& connection, std::uint32_t pipe) {
    const auto buffer = std::make_unique<std::uint8_t[]>(64);
    ControlBlock inward{1};
    pipe == 1   ? connection.Read(buffer.get(), 64, 64)
    : pipe == 2 ? connection.Write(buffer.get(), 64, 640)
                : static_cast<void>(connection.PerformDeviceIOControl(
                      inward, Protocol::NativeDriver::ControlVendorRequest, buffer.get(), 64, true));
}

TEST_F(UsbConnection, EndsEachTransferInTimeAndReportsIt) {
    const Bytes data = Counting(64, 1);
    const Answer slow{.data = data, .after = Never, .cancelledAfter = 40, .cancelledWithData = true};
    const Answer stalled{.data = data, .code = 31};
    const std::string timedOut = "Device IO control failed ", few = " data failed (Not enough data)";
    // Pipe 0 is a control. The operation returns after so many milliseconds, with this text of its failure.
    const std::vector<std::tuple<const char*, std::uint32_t, Answer, std::uint64_t, std::string>> cases{
        {"control, slow", 0, slow, 2041, timedOut + ErrorSuffix(Errors::IoPending)},
        {"control, not started", 0, {.refusal = 5}, 2001, timedOut + ErrorSuffix(5)},
        {"read, slow", 1, slow, 5104, "read data failed" + ErrorSuffix(Errors::IoIncomplete)},
        {"read, stalled behind all data", 1, stalled, 0, "read data failed" + ErrorSuffix(31)},
        {"read, short", 1, {.data = Bytes(60)}, 0, "read" + few},
        {"read, longer", 1, {.data = data, .count = 65}, 0, "read" + few},
    };
    for (const auto& [name, pipe, answer, milliseconds, text] : cases) {
        SCOPED_TRACE(name);
        USBConnection connection(Path, pipe, NoHandle);
        driver_.Script(pipe, answer);
        const Stopwatch watch(clock_);
        const auto operation = [&] { Transfer(connection, pipe); };
        pipe == 0 ? ExpectThrow<TimeoutException>(text, operation)
                  : ExpectThrow<IOException>(text, operation);
        watch.Expect(milliseconds);
        EXPECT_EQ(driver_.Running(), 0u);
    }
}

void ReadOneByte(PellandoUSBDevice& device) {
    std::uint8_t byte = 0;
    device.ReadData(&byte, 1, 0);
}

class NativeDevice : public DriverTest {
  protected:
    std::unique_ptr<PellandoUSBDevice> Open() {
        auto device = std::make_unique<PellandoUSBDevice>(&listener_, Path);
        WaitUntil([this] { return driver_.Running(InterruptPipe) == 1; });
        return device;
    }
    RecordingListener listener_;
};

TEST_F(NativeDevice, OpensItsPipesAndClosesThemInReverse) {
    auto device = Open();
    driver_.Script(0, {.code = 31});  // an instrument that is gone fails what is sent at the end
    driver_.Script(0, {.code = 31});
    device.reset();
    EXPECT_THAT(driver_.TakeTranscript(),
                ElementsAre("open native/1", "open native/1\\PIPE01", "open native/1\\PIPE02",
                            "open native/1\\PIPE03", "read 3 [8]",
                            "control 220009 00 00 00 00 00 00 84 00 00 00 / 00 00 00 00 00 00 00 00",
                            "control 220011 00 02 00 00 D0 00 03 00 00 00 / 00 00 00 00 00 00 00 00",
                            "cancel 3", "close native/1\\PIPE03", "close native/1\\PIPE02",
                            "close native/1\\PIPE01", "close native/1"));
}

TEST_F(NativeDevice, ThatCannotBeOpenedLeavesNothingBehind) {
    const auto expectFailure = [&](const std::string& text) {
        ExpectThrow<IOException>(text, [&] { PellandoUSBDevice device(&listener_, Path); });
        EXPECT_EQ(driver_.OpenFiles(), 0u);
        EXPECT_THAT(listener_.Codes(), IsEmpty()) << "who gets no device gets no messages";
    };
    // The thread has reported its start and waits with a message when that is not seen.
    driver_.Script(InterruptPipe, {.data = {1}, .after = 1});
    InstallCallFilter([waits = 0, opener = std::this_thread::get_id()](std::string_view call) mutable {
        const bool fails = call == "Wait" && std::this_thread::get_id() == opener && ++waits == 2;
        SleepMilliseconds(fails ? 10 : 0);
        return fails ? Errors::NoSystemResources : Errors::Success;
    });
    expectFailure("interrupt listener thread had timeout");
    driver_.TakeTranscript();
    FailCalls("StartThread");
    expectFailure("could not create interrupt listener thread");
    InstallCallFilter({});
    driver_.RefuseOpen(Path + "\\PIPE03", Errors::FileNotFound);
    expectFailure("interrupt listener thread had timeout");
    for (const char* pipe : {"\\PIPE02", "\\PIPE01", ""}) {
        driver_.RefuseOpen(Path + pipe, Errors::FileNotFound);
        expectFailure("could not open pipe:" + ErrorSuffix(Errors::FileNotFound));
    }
    EXPECT_THAT(driver_.TakeTransfers(), IsEmpty());
}

TEST_F(NativeDevice, ClosesItsPipesWhenTheInstrumentIsGone) {
    auto device = Open();
    driver_.TakeTranscript();
    driver_.Complete(InterruptPipe, Answer{.code = Errors::DeviceNotConnected});
    WaitUntil([&] { return driver_.OpenFiles() == 0; });
    EXPECT_THAT(listener_.Codes(), ElementsAre(MessageDeviceGone));
    EXPECT_THAT(driver_.TakeTranscript(), ElementsAre("close native/1\\PIPE02", "close native/1\\PIPE01",
                                                      "close native/1", "close native/1\\PIPE03"));
    ExpectThrow<IOException>("read data failed" + ErrorSuffix(Errors::InvalidHandle),
                             [&] { ReadOneByte(*device); });
    device.reset();
    EXPECT_THAT(driver_.TakeTranscript(), IsEmpty());
}

TEST_F(NativeDevice, DoesNotTellThatTheInstrumentHasGoneOnceItIsBeingClosed) {
    auto device = Open();
    driver_.Script(0, {.onStart = [&] {
                       driver_.Complete(InterruptPipe, Answer{.code = Errors::DeviceNotConnected});
                       SleepMilliseconds(10);
                   }});
    device.reset();
    EXPECT_THAT(listener_.Codes(), IsEmpty());
}

/// Whoever holds the mutex named after the path keeps every transfer of every device of that path waiting.
TEST_F(NativeDevice, TakesTheDeviceLockForEveryTransfer) {
    auto device = Open();
    ScanRecordList records;
    std::uint8_t byte = 0;
    const std::function<void()> operations[] = {
        [&] { device->MessageFromDevice(MessageButtonData, 0); },
        [&] { device->PerformDeviceIOControl({}, nullptr, 0); },
        [&] { ReadOneByte(*device); },
        [&] { device->WriteData(&byte, 1, 0); },
        [&] { device->ReadDataStrip(records, 1, 0); },
        [&] { device->ReadDataCountedStrip(records, 1, 0, 1); },
        [&] { device->RemoveListener(&listener_); },
    };
    for (const auto& operation : operations) {
        driver_.Script(1, {.data = {7}});
        Mutex mutex("native1");
        mutex.Lock();
        BackgroundThread other(operation);
        SleepMilliseconds(100);
        EXPECT_FALSE(other.HasEnded());
        mutex.Unlock();
        WaitUntil([&] { return other.HasEnded(); });
    }
}

// RemoveListener against a message under way. With the two locks taken in different orders these would never
// end.

TEST_F(NativeDevice, RemovesAListenerWhoseMessageWaitsForTheDeviceLock) {
    auto device = Open();
    {
        Mutex mutex("native1");
        const ScopedLock held(mutex);
        driver_.Complete(InterruptPipe, ButtonData);
        SleepMilliseconds(10);  // the message waits for the lock
        device->RemoveListener(&listener_);
    }
    SleepMilliseconds(10);
    EXPECT_THAT(listener_.Codes(), IsEmpty());
}

TEST_F(NativeDevice, MayBeUsedAndClosedFromInsideAMessage) {
    for (const std::uint32_t code : {MessageButtonData, MessageDeviceGone}) {
        auto device = Open();
        std::atomic<bool> hasReturned = false;
        listener_.onMessage = [&](std::uint32_t received) {
            EXPECT_EQ(received, code);
            driver_.Script(1, {.data = {7}});
            EXPECT_NO_THROW(ReadOneByte(*device));
            const Stopwatch watch(clock_);
            device.reset();
            watch.ExpectAtMost(2u);
            hasReturned = true;
        };
        driver_.Complete(InterruptPipe, code == MessageButtonData ? ButtonData : Answer{});
        WaitUntil([&] { return hasReturned.load() && driver_.OpenFiles() == 0; });
        EXPECT_EQ(device, nullptr);
    }
    EXPECT_THAT(listener_.Codes(), ElementsAre(MessageButtonData, MessageDeviceGone));
}

/// Closing is bounded even if somebody holds the device lock and the listener's thread waits for it; that
/// thread then finds everything it touches in place, and its message is dropped. Without a listener it does
/// not wait at all.
TEST_F(NativeDevice, ClosesInTimeWhileSomebodyHoldsTheDeviceLock) {
    const struct {
        bool isRemoved, isPressed;
        std::uint64_t most;
        std::size_t transfers;
    } cases[] = {{false, false, 5, 3}, {false, true, 11'001, 0}, {true, true, 5, 2}};
    for (const auto& [isRemoved, isPressed, most, transfers] : cases) {
        auto device = Open();
        if (isRemoved) {
            device->RemoveListener(&listener_);
        }
        driver_.TakeTranscript();
        {
            Mutex mutex("native1");
            const ScopedLock held(mutex);
            if (isPressed) {
                driver_.Complete(InterruptPipe, ButtonData);
                SleepMilliseconds(10);
            }
            const Stopwatch watch(clock_);
            BackgroundThread closer([&] { device.reset(); });
            WaitUntil([&] { return closer.HasEnded(); });
            watch.ExpectAtMost(most);
            EXPECT_EQ(driver_.OpenFiles(), 0u);
            EXPECT_THAT(driver_.TakeTransfers(), testing::SizeIs(transfers)) << "as ever";
        }
        SleepMilliseconds(10);
        EXPECT_THAT(listener_.Codes(), IsEmpty());
    }
}

TEST(NativeDeviceName, KeepsLettersAndDigits) {
    EXPECT_EQ(PellandoUSBDevice::StripStrangeChars(
                  "\\\\?\\usb#Vid_04b4&pid_1004#5&2a#{00873FDF-61A8}.\xC4z9:0/A@Z[a`"),
              "usbVid04b4pid100452a00873FDF61A8z90AZa");
}

}  // namespace
}  // namespace Varnholt::Tests
