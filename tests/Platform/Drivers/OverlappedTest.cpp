#include <thread>
#include <vector>

#include "Platform/CallFilter.h"
#include "Platform/Drivers/DriverFixture.h"
#include "Platform/OverlappedRequest.h"
#include "Platform/Threads.h"

namespace Varnholt::Tests {
namespace {

namespace Errors = Platform::Errors;
namespace Native = Protocol::NativeDriver;
using Platform::WaitResult;

constexpr std::uint8_t In = Protocol::BulkInEndpoint;
constexpr std::uint8_t Interrupt = Protocol::InterruptInEndpoint;

/// What holds for every file, whichever driver stands behind it.
class OverlappedFiles : public DriverFixture {
  protected:
    OverlappedFiles() {
        device_->LeaveToTest(In);
        device_->LeaveToTest(Interrupt);
    }

    Platform::Handle pipe_ = OpenPipe(Native::ReadPipe);
    Bytes buffer_ = Bytes(8);
    Request request_;
};

TEST_F(OverlappedFiles, SignalAtCompletionAndResetAtStart) {
    Platform::SignalEvent(request_.event.Get());
    StartPending(pipe_, buffer_, request_);
    EXPECT_FALSE(request_.TakeSignal()) << "a signal from before the start";
    EXPECT_EQ(Result(pipe_, request_), (Outcome{Errors::IoIncomplete, 0}));

    device_->Send(In, {1, 2, 3});
    EXPECT_EQ(Platform::Wait(request_.event.Get(), 1000), WaitResult::Signalled);
    EXPECT_EQ(Result(pipe_, request_), (Outcome{0, 3}));
    EXPECT_EQ(Result(pipe_, request_), (Outcome{0, 3})) << "asking does not change the record";
    EXPECT_FALSE(request_.TakeSignal()) << "signalled twice";

    device_->Send(In, {4});
    EXPECT_TRUE(StartRead(pipe_, buffer_, request_)) << "completed inside the start";
    EXPECT_TRUE(request_.TakeSignal());
    EXPECT_EQ(Result(pipe_, request_), (Outcome{0, 1}));
}

TEST_F(OverlappedFiles, AnEventIsNotNeeded) {
    request_.record.event = Platform::NoHandle;
    StartPending(pipe_, buffer_, request_);
    std::thread sender([this] { device_->Send(In, {1, 2}); });
    EXPECT_EQ(Result(pipe_, request_, true), (Outcome{0, 2}));
    sender.join();
}

TEST_F(OverlappedFiles, ARunningRecordIsNotStartedAgain) {
    Bytes other(8);
    StartPending(pipe_, buffer_, request_);
    EXPECT_FALSE(StartRead(pipe_, other, request_));
    EXPECT_EQ(Platform::LastError(), Errors::InvalidParameter);
    device_->Send(In, {9});
    EXPECT_EQ(Result(pipe_, request_, true), (Outcome{0, 1}));
    EXPECT_EQ(buffer_[0], 9);
    EXPECT_EQ(other[0], 0);
}

// The signal of a shared event says that one of its requests has ended, not which.
TEST_F(OverlappedFiles, WaitForTheirOwnEndWhereAnEventIsShared) {
    const auto interruptPipe = OpenPipe(Native::InterruptPipe);
    for (const bool eventTaken : {false, true}) {
        Bytes read(8), interrupt(8);
        Request reading, listening;
        listening.record.event = reading.record.event;
        StartPending(pipe_, read, reading);
        StartPending(interruptPipe, interrupt, listening);
        std::thread completer([&] {
            device_->Send(Interrupt, {1});
            if (eventTaken) {
                Platform::Wait(reading.event.Get(), 1000);
            }
            Platform::SleepMilliseconds(5);
            device_->Send(In, {2, 3});
            if (eventTaken) {
                Platform::Wait(reading.event.Get(), 1000);
            }
        });
        EXPECT_EQ(Result(pipe_, reading, true), (Outcome{0, 2}));
        EXPECT_EQ(Result(interruptPipe, listening, true), (Outcome{0, 1}));
        completer.join();
        EXPECT_EQ(reading.TakeSignal(), !eventTaken) << "the wait takes no signal from its caller";
    }
}

TEST_F(OverlappedFiles, WaitWithoutAnEventOfTheirOwn) {
    StartPending(pipe_, buffer_, request_);
    Platform::InstallCallFilter([](std::string_view call) {
        return call == "MakeAutoResetEvent" ? Errors::NoSystemResources : Errors::Success;
    });
    std::thread sender([this] {
        Platform::SleepMilliseconds(5);
        device_->Send(In, {1, 2});
    });
    EXPECT_EQ(Result(pipe_, request_, true), (Outcome{0, 2}));
    sender.join();
    StartPending(pipe_, buffer_, request_);
    EXPECT_TRUE(files_->CloseFile(pipe_));
    Platform::InstallCallFilter({});
    EXPECT_EQ(Result(pipe_, request_), (Outcome{Errors::OperationAborted, 0}));
}

TEST_F(OverlappedFiles, CancelOnlyWhatTheCallerStartedOnTheFile) {
    const auto second = OpenPipe(Native::ReadPipe);
    const auto interruptPipe = OpenPipe(Native::InterruptPipe);
    Bytes buffers[4] = {Bytes(8), Bytes(8), Bytes(8), Bytes(8)};
    Request own, ofOtherThread, onOtherHandle, onOtherPipe;
    StartPending(pipe_, buffers[0], own);
    std::thread([&] { StartPending(pipe_, buffers[1], ofOtherThread); }).join();
    StartPending(second, buffers[2], onOtherHandle);
    StartPending(interruptPipe, buffers[3], onOtherPipe);

    EXPECT_TRUE(files_->CancelTransfers(pipe_));
    EXPECT_EQ(Result(pipe_, own, true), (Outcome{Errors::OperationAborted, 0}));
    EXPECT_EQ(Result(pipe_, ofOtherThread).code, Errors::IoIncomplete);
    EXPECT_EQ(Result(second, onOtherHandle).code, Errors::IoIncomplete);
    EXPECT_EQ(Result(interruptPipe, onOtherPipe).code, Errors::IoIncomplete);
    EXPECT_TRUE(files_->CancelTransfers(pipe_)) << "nothing left to cancel";
    for (const auto file : {pipe_, second, interruptPipe}) {
        EXPECT_TRUE(files_->CloseFile(file));
    }
}

TEST_F(OverlappedFiles, ClosingEndsWhatRuns) {
    for (const bool later : {false, true}) {
        device_->CancelLater(later);
        std::vector<Bytes> buffers(20, Bytes(8));
        std::vector<Request> requests(20);
        for (std::size_t i = 0; i < requests.size(); ++i) {
            std::thread([&] { StartPending(pipe_, buffers[i], requests[i]); }).join();
        }
        EXPECT_TRUE(files_->CloseFile(pipe_));
        for (Request& each : requests) {
            EXPECT_EQ(Result(pipe_, each), (Outcome{Errors::OperationAborted, 0}));
            EXPECT_TRUE(each.TakeSignal());
        }
        EXPECT_FALSE(device_->IsOpen());
        pipe_ = OpenPipe(Native::ReadPipe);
    }
}

TEST_F(OverlappedFiles, AnUnpluggedDeviceEndsEverythingAndAnotherTakesItsPlace) {
    const auto main = Open("native/port1");
    Bytes buffers[2] = {Bytes(8), Bytes(8)};
    Request requests[2];
    StartPending(pipe_, buffers[0], requests[0]);
    StartPending(pipe_, buffers[1], requests[1]);
    bus_.Unplug("port1");
    EXPECT_EQ(Result(pipe_, requests[0], true), (Outcome{Errors::DeviceNotConnected, 0}));
    EXPECT_EQ(Result(pipe_, requests[1], true), (Outcome{Errors::DeviceNotConnected, 0}));
    EXPECT_EQ(Read(pipe_, buffers[0]).code, Errors::DeviceNotConnected);
    EXPECT_EQ(Control(main, Native::ControlVendorRequest, NativeBlock(0xC0, 0)).code,
              Errors::DeviceNotConnected);
    EXPECT_EQ(OpenError("native/port1"), Errors::FileNotFound);

    const auto replugged = std::make_shared<ScriptedUsbDevice>(std::vector{VendorOut(0xC0, {})});
    bus_.Plug("port1", replugged);
    const auto fresh = Open("native/port1");
    EXPECT_EQ(Control(fresh, Native::ControlVendorRequest, NativeBlock(0xC0, 0)).code, Errors::Success);
    EXPECT_EQ(Control(main, Native::ControlVendorRequest, NativeBlock(0xC0, 0)).code,
              Errors::DeviceNotConnected);
    EXPECT_TRUE(files_->CloseFile(pipe_));
    EXPECT_TRUE(files_->CloseFile(main));
    EXPECT_FALSE(device_->IsOpen());
    EXPECT_TRUE(files_->CloseFile(fresh));
}

TEST_F(OverlappedFiles, RefuseHandlesThatNameNothing) {
    const auto stale = pipe_;
    EXPECT_TRUE(files_->CloseFile(stale));
    const auto reopened = OpenPipe(Native::ReadPipe);
    EXPECT_NE(stale, reopened);
    const auto unused = reinterpret_cast<Platform::Handle>(reinterpret_cast<std::uintptr_t>(reopened) + 4);
    for (const auto handle :
         {stale, Platform::NoHandle, Platform::InvalidHandle(), request_.event.Get(), unused}) {
        EXPECT_EQ(Read(handle, buffer_).code, Errors::InvalidHandle) << handle;
        EXPECT_EQ(Write(handle, buffer_).code, Errors::InvalidHandle) << handle;
        EXPECT_EQ(Control(handle, Native::ControlVendorRequest, NativeBlock(0xC0, 0)).code,
                  Errors::InvalidHandle)
            << handle;
        EXPECT_FALSE(files_->CancelTransfers(handle));
        EXPECT_EQ(Platform::LastError(), Errors::InvalidHandle) << handle;
        EXPECT_FALSE(files_->CloseFile(handle));
        EXPECT_EQ(Platform::LastError(), Errors::InvalidHandle) << handle;
    }
    EXPECT_FALSE(Platform::Close(reopened)) << "not a waitable object";
    EXPECT_EQ(Platform::Wait(reopened, 0), WaitResult::Failed);
    EXPECT_TRUE(files_->CloseFile(reopened));
}

// A failure put into the question for the result must not pass for the end of the transfer.
TEST_F(OverlappedFiles, AFailingQuestionDoesNotReleaseTheBuffer) {
    StartPending(pipe_, buffer_, request_);
    Platform::InstallCallFilter(
        [](std::string_view call) { return call == "GetResult" ? Errors::GeneralFailure : Errors::Success; });
    EXPECT_EQ(Result(pipe_, request_).code, Errors::IoIncomplete);
    device_->Send(In, {1, 2, 3});
    EXPECT_EQ(Result(pipe_, request_, true), (Outcome{Errors::GeneralFailure, 3}));
    Platform::InstallCallFilter({});
}

TEST_F(OverlappedFiles, AllFilesLeftOpenAreClosedWithTheFileSystem) {
    Open("usbio/port1");
    StartPending(pipe_, buffer_, request_);
    files_.reset();
    EXPECT_FALSE(device_->IsOpen());
    EXPECT_TRUE(request_.TakeSignal());
}

TEST_F(OverlappedFiles, ServeRequestsThatEndTheirTransfer) {
    const Platform::ScopedDeviceFiles scope(*files_);
    {
        Platform::OverlappedRequest owning(request_.event.Get());
        EXPECT_FALSE(owning.StartRead(pipe_, buffer_.data(), 8));
        EXPECT_EQ(device_->Pending(In), 1u);
    }
    EXPECT_EQ(device_->Pending(In), 0u);
}

TEST_F(OverlappedFiles, RunOutOfPlacesAndRecover) {
    std::vector<Platform::Handle> opened;
    for (Platform::Handle file; (file = files_->Open("usbio/port1")) != Platform::InvalidHandle();) {
        opened.push_back(file);
    }
    EXPECT_EQ(Platform::LastError(), Errors::NoSystemResources);
    EXPECT_GE(opened.size(), 512u) << "four files on each of 127 instruments";
    EXPECT_TRUE(files_->CloseFile(opened.front()));
    opened.front() = Open("usbio/port1");
    for (const auto file : opened) {
        EXPECT_TRUE(files_->CloseFile(file));
    }
}

}  // namespace
}  // namespace Varnholt::Tests
