#include <atomic>
#include <functional>

#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "NativeTest.h"
#include "Platform/CallFilter.h"
#include "Utilities/Multithreading/Mutex.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Generic::MessageButtonData;
using DeviceDriver::Generic::MessageDeviceGone;
using DeviceDriver::Ostra::LowLevel::PellandoUSBDevice;
using DeviceDriver::Ostra::LowLevel::ScanRecordList;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using Varnholt::Utilities::Multithreading::Mutex;
using Varnholt::Utilities::Multithreading::ScopedLock;

constexpr std::uint32_t InterruptPipe = 3;
const Answer ButtonData{.data = {1}};
const std::string Path = "native/1";

void ReadOneByte(PellandoUSBDevice& device) {
    std::uint8_t byte = 0;
    device.ReadData(&byte, 1, 0);
}

class NativeDevice : public NativeTest {
  protected:
    NativeDevice() : NativeTest(TestTime::RealForThreadSanitizer) {}

    std::unique_ptr<PellandoUSBDevice> Open() {
        auto device = std::make_unique<PellandoUSBDevice>(&listener_, Path);
        WaitUntil([this] { return IsListening(); });
        return device;
    }
    RecordingListener listener_;
};

TEST_F(NativeDevice, OpensItsPipesAndClosesThemInReverse) {
    Open().reset();
    Lines transcript = driver_.TakeTranscript();
    EXPECT_THAT(transcript,
                ElementsAre("open native/1", "open native/1\\PIPE01", "open native/1\\PIPE02",
                            "open native/1\\PIPE03", "read 3 [8]",
                            "control 220009 00 00 00 00 00 00 84 00 00 00 / 00 00 00 00 00 00 00 00",
                            "control 220011 00 02 00 00 D0 00 03 00 00 00 / 00 00 00 00 00 00 00 00",
                            "cancel 3", "close native/1\\PIPE03", "close native/1\\PIPE02",
                            "close native/1\\PIPE01", "close native/1"));
}

TEST_F(NativeDevice, SaysNothingOfAButtonThatWasUsed) {
    auto device = Open();
    driver_.Complete(InterruptPipe, ButtonData);
    WaitUntil([&] { return !listener_.Codes().empty() && IsListening(); });
    driver_.Script(1, {.data = {7}});
    EXPECT_NO_THROW(ReadOneByte(*device)) << "only the end of the instrument closes its pipes";
    driver_.TakeTranscript();
    device.reset();
    EXPECT_THAT(driver_.TakeTransfers(), ElementsAre("cancel 3"));
    EXPECT_THAT(listener_.Codes(), ElementsAre(MessageButtonData));
}

TEST_F(NativeDevice, ThatCannotBeOpenedLeavesNothingBehind) {
    const auto expectFailure = [&](const std::string& text) {
        ExpectThrow<IOException>(text, [] { PellandoUSBDevice device(nullptr, Path); });
        EXPECT_EQ(driver_.OpenFiles(), 0u);
        EXPECT_THAT(driver_.TakeTransfers(), IsEmpty());
    };
    InstallCallFilter([](std::string_view call) {
        return call == "StartThread" ? Errors::NoSystemResources : Errors::Success;
    });
    expectFailure("could not create interrupt listener thread");
    InstallCallFilter({});
    driver_.RefuseOpen(Path + "\\PIPE03", Errors::FileNotFound);
    expectFailure("interrupt listener thread had timeout");
    for (const char* pipe : {"\\PIPE02", "\\PIPE01", ""}) {
        driver_.RefuseOpen(Path + pipe, Errors::FileNotFound);
        expectFailure("could not open pipe:" + ErrorSuffix(Errors::FileNotFound));
    }
}

TEST_F(NativeDevice, ClosesItsPipesWhenTheInstrumentIsGone) {
    auto device = Open();
    driver_.TakeTranscript();
    driver_.Complete(InterruptPipe, {.code = Errors::DeviceNotConnected});
    WaitUntil([&] { return driver_.OpenFiles() == 0; });
    EXPECT_THAT(listener_.Codes(), ElementsAre(MessageDeviceGone));
    EXPECT_THAT(driver_.TakeTranscript(), ElementsAre("close native/1\\PIPE02", "close native/1\\PIPE01",
                                                      "close native/1", "close native/1\\PIPE03"));
    const std::string suffix = ErrorSuffix(Errors::InvalidHandle);
    ExpectThrow<IOException>("read data failed" + suffix, [&] { ReadOneByte(*device); });
    ExpectThrow<TimeoutException>("Device IO control failed " + suffix,
                                  [&] { device->PerformDeviceIOControl({}, nullptr, 0); });
    ScanRecordList records;
    ExpectThrow<IOException>("Read data failed (OverlappedRead)",
                             [&] { device->ReadDataStrip(records, 5, 0); });
    device.reset();
    EXPECT_THAT(driver_.TakeTranscript(), IsEmpty());
}

/// Whoever holds the mutex named after the path keeps every transfer of every device of that path waiting.
TEST_F(NativeDevice, TakesTheDeviceLockForEveryTransfer) {
    auto device = Open();
    ScanRecordList records;
    std::uint8_t byte = 0;
    const std::function<void()> operations[] = {
        [&] { device->PerformDeviceIOControl({}, nullptr, 0); },
        [&] { ReadOneByte(*device); },
        [&] { device->WriteData(&byte, 1, 0); },
        [&] { device->ReadDataStrip(records, 1, 0); },
        [&] { device->ReadDataCountedStrip(records, 1, 0, 1); },
        [&] { device->MessageFromDevice(MessageButtonData, 0); },
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
    driver_.Complete(InterruptPipe, ButtonData);
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
/// thread then finds everything it touches in place, and its message is dropped.
TEST_F(NativeDevice, ClosesInTimeWhileAMessageWaitsForTheDeviceLock) {
    const OwnedHandle release(MakeAutoResetEvent());
    std::atomic<bool> isHeld = false;
    auto device = Open();
    BackgroundThread holder([&] {
        Mutex mutex("native1");
        const ScopedLock held(mutex);
        isHeld = true;
        Wait(release.Get(), Infinite);
    });
    WaitUntil([&] { return isHeld.load(); });
    driver_.Complete(InterruptPipe, ButtonData);
    SleepMilliseconds(10);  // the message waits for the lock
    const Stopwatch watch(clock_);
    device.reset();
    watch.ExpectAtMost(11'000u);
    EXPECT_EQ(driver_.OpenFiles(), 0u);
    SignalEvent(release.Get());
    holder.Join();
    SleepMilliseconds(10);
    EXPECT_THAT(listener_.Codes(), IsEmpty());
}

TEST_F(NativeDevice, ClosesAtOnceWhileSomebodyHoldsTheDeviceLock) {
    auto device = Open();
    driver_.TakeTranscript();
    Mutex mutex("native1");
    const ScopedLock held(mutex);
    const Stopwatch watch(clock_);
    BackgroundThread closer([&] { device.reset(); });
    WaitUntil([&] { return closer.HasEnded(); });
    watch.ExpectAtMost(5);
    EXPECT_THAT(
        driver_.TakeTransfers(),
        ElementsAre("control 220009 00 00 00 00 00 00 84 00 00 00 / 00 00 00 00 00 00 00 00",
                    "control 220011 00 02 00 00 D0 00 03 00 00 00 / 00 00 00 00 00 00 00 00", "cancel 3"));
}

TEST(NativeDeviceName, KeepsLettersAndDigits) {
    EXPECT_EQ(PellandoUSBDevice::StripStrangeChars(
                  "\\\\?\\usb#Vid_04b4&pid_1004#5&2a#{00873FDF-61A8}.\xC4z9:0/A@Z[a`"),
              "usbVid04b4pid100452a00873FDF61A8z90AZa");
    EXPECT_EQ(PellandoUSBDevice::StripStrangeChars("\\?#&{}-_./@[`~ "), "");
}

}  // namespace
}  // namespace Varnholt::Tests
