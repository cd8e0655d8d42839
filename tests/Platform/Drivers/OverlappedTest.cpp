#include <functional>
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
class OverlappedFiles : public DriverFixture {};

TEST_F(OverlappedFiles, SignalAtCompletionAndResetAtStart) {
    device->LeaveToTest(In);
    const auto pipe = OpenPipe(Native::ReadPipe);
    Bytes buffer(8);
    Request request;
    Platform::SignalEvent(request.event.Get());
    StartPending(pipe, buffer, request);
    EXPECT_FALSE(request.TakeSignal()) << "a signal from before the start";
    EXPECT_EQ(Result(pipe, request), (Outcome{Errors::IoIncomplete, 0}));

    device->Send(In, {1, 2, 3});
    EXPECT_EQ(Platform::Wait(request.event.Get(), 1000), WaitResult::Signalled);
    EXPECT_EQ(Result(pipe, request), (Outcome{0, 3}));
    EXPECT_EQ(Result(pipe, request), (Outcome{0, 3})) << "asking does not change the record";
    EXPECT_FALSE(request.TakeSignal()) << "signalled twice";

    device->Send(In, {4});
    EXPECT_TRUE(StartRead(pipe, buffer, request)) << "completed inside the start";
    EXPECT_TRUE(request.TakeSignal());
    EXPECT_EQ(Result(pipe, request), (Outcome{0, 1}));
}

TEST_F(OverlappedFiles, AnEventIsNotNeeded) {
    device->LeaveToTest(In);
    const auto pipe = OpenPipe(Native::ReadPipe);
    Bytes buffer(8);
    Request request;
    request.record.event = Platform::NoHandle;
    StartPending(pipe, buffer, request);
    std::thread sender([this] { device->Send(In, {1, 2}); });
    EXPECT_EQ(Result(pipe, request, true), (Outcome{0, 2}));
    sender.join();
}

TEST_F(OverlappedFiles, ARunningRecordIsNotStartedAgain) {
    device->LeaveToTest(In);
    const auto pipe = OpenPipe(Native::ReadPipe);
    Bytes buffer(8), other(8);
    Request request;
    StartPending(pipe, buffer, request);
    EXPECT_FALSE(StartRead(pipe, other, request));
    EXPECT_EQ(Platform::LastError(), Errors::InvalidParameter);
    device->Send(In, {9});
    EXPECT_EQ(Result(pipe, request, true), (Outcome{0, 1}));
    EXPECT_EQ(buffer[0], 9);
    EXPECT_EQ(other[0], 0);
}

// The signal of a shared event says that one of its requests has ended, not which.
TEST_F(OverlappedFiles, WaitForTheirOwnEndWhereAnEventIsShared) {
    device->LeaveToTest(In);
    device->LeaveToTest(Interrupt);
    const auto readPipe = OpenPipe(Native::ReadPipe);
    const auto interruptPipe = OpenPipe(Native::InterruptPipe);
    for (const bool eventTaken : {false, true}) {
        Bytes read(8), interrupt(8);
        Request reading, listening;
        listening.record.event = reading.record.event;
        StartPending(readPipe, read, reading);
        StartPending(interruptPipe, interrupt, listening);
        std::thread completer([&] {
            device->Send(Interrupt, {1});
            if (eventTaken) {
                Platform::Wait(reading.event.Get(), 1000);
            }
            Platform::SleepMilliseconds(5);
            device->Send(In, {2, 3});
            if (eventTaken) {
                Platform::Wait(reading.event.Get(), 1000);
            }
        });
        EXPECT_EQ(Result(readPipe, reading, true), (Outcome{0, 2}));
        EXPECT_EQ(Result(interruptPipe, listening, true), (Outcome{0, 1}));
        completer.join();
        EXPECT_EQ(reading.TakeSignal(), !eventTaken) << "the wait takes no signal from its caller";
    }
}

TEST_F(OverlappedFiles, WaitWithoutAnEventOfTheirOwn) {
    device->LeaveToTest(In);
    const auto pipe = OpenPipe(Native::ReadPipe);
    Bytes buffer(8);
    Request request;
    StartPending(pipe, buffer, request);
    Platform::InstallCallFilter([](std::string_view call) {
        return call == "MakeAutoResetEvent" ? Errors::NoSystemResources : Errors::Success;
    });
    std::thread sender([this] {
        Platform::SleepMilliseconds(5);
        device->Send(In, {1, 2});
    });
    EXPECT_EQ(Result(pipe, request, true), (Outcome{0, 2}));
    sender.join();
    StartPending(pipe, buffer, request);
    EXPECT_TRUE(files->CloseFile(pipe));
    Platform::InstallCallFilter({});
    EXPECT_EQ(Result(pipe, request), (Outcome{Errors::OperationAborted, 0}));
}

TEST_F(OverlappedFiles, CancelOnlyWhatTheCallerStartedOnTheFile) {
    device->LeaveToTest(In);
    device->LeaveToTest(Interrupt);
    const auto readPipe = OpenPipe(Native::ReadPipe);
    const auto second = OpenPipe(Native::ReadPipe);
    const auto interruptPipe = OpenPipe(Native::InterruptPipe);
    Bytes buffers[4] = {Bytes(8), Bytes(8), Bytes(8), Bytes(8)};
    Request own, ofOtherThread, onOtherHandle, onOtherPipe;
    StartPending(readPipe, buffers[0], own);
    std::thread([&] { StartPending(readPipe, buffers[1], ofOtherThread); }).join();
    StartPending(second, buffers[2], onOtherHandle);
    StartPending(interruptPipe, buffers[3], onOtherPipe);

    EXPECT_TRUE(files->CancelTransfers(readPipe));
    EXPECT_EQ(Result(readPipe, own, true), (Outcome{Errors::OperationAborted, 0}));
    EXPECT_EQ(Result(readPipe, ofOtherThread).code, Errors::IoIncomplete);
    EXPECT_EQ(Result(second, onOtherHandle).code, Errors::IoIncomplete);
    EXPECT_EQ(Result(interruptPipe, onOtherPipe).code, Errors::IoIncomplete);
    EXPECT_TRUE(files->CancelTransfers(readPipe)) << "nothing left to cancel";
    for (const auto file : {readPipe, second, interruptPipe}) {
        EXPECT_TRUE(files->CloseFile(file));
    }
}

TEST_F(OverlappedFiles, ACancelledTransferCountsWhatItMoved) {
    device->Expect({BulkIn(16, Counting(16)).OnDemand().MovesWhenCancelled(10)});
    const auto pipe = OpenPipe(Native::ReadPipe);
    Bytes buffer(16);
    Request request;
    StartPending(pipe, buffer, request);
    device->CancelLater(true);
    EXPECT_TRUE(files->CancelTransfers(pipe));
    EXPECT_EQ(Result(pipe, request, true), (Outcome{Errors::OperationAborted, 10}));
    EXPECT_EQ(buffer[9], 9);
}

TEST_F(OverlappedFiles, ClosingEndsWhatRuns) {
    for (const bool later : {false, true}) {
        device->LeaveToTest(In);
        device->CancelLater(later);
        const auto pipe = OpenPipe(Native::ReadPipe);
        std::vector<Bytes> buffers(20, Bytes(8));
        std::vector<Request> requests(20);
        for (std::size_t i = 0; i < requests.size(); ++i) {
            std::thread([&] { StartPending(pipe, buffers[i], requests[i]); }).join();
        }
        EXPECT_TRUE(files->CloseFile(pipe));
        for (Request& request : requests) {
            EXPECT_EQ(Result(pipe, request), (Outcome{Errors::OperationAborted, 0}));
            EXPECT_TRUE(request.TakeSignal());
        }
        EXPECT_FALSE(device->IsOpen());
    }
}

TEST_F(OverlappedFiles, AnUnpluggedDeviceEndsEverythingAndAnotherTakesItsPlace) {
    device->LeaveToTest(In);
    const auto main = Open("native/port1");
    const auto pipe = OpenPipe(Native::ReadPipe);
    Bytes buffers[2] = {Bytes(8), Bytes(8)};
    Request requests[2];
    StartPending(pipe, buffers[0], requests[0]);
    StartPending(pipe, buffers[1], requests[1]);
    bus.Unplug("port1");
    EXPECT_EQ(Result(pipe, requests[0], true), (Outcome{Errors::DeviceNotConnected, 0}));
    EXPECT_EQ(Result(pipe, requests[1], true), (Outcome{Errors::DeviceNotConnected, 0}));
    EXPECT_EQ(Read(pipe, buffers[0]).code, Errors::DeviceNotConnected);
    EXPECT_EQ(Control(main, Native::ControlVendorRequest, NativeBlock(0xC0, 0)).code,
              Errors::DeviceNotConnected);
    EXPECT_EQ(OpenError("native/port1"), Errors::FileNotFound);

    const auto replugged = std::make_shared<ScriptedUsbDevice>(std::vector{VendorOut(0xC0, {})});
    bus.Plug("port1", replugged);
    const auto fresh = Open("native/port1");
    EXPECT_EQ(Control(fresh, Native::ControlVendorRequest, NativeBlock(0xC0, 0)).code, Errors::Success);
    EXPECT_EQ(Control(main, Native::ControlVendorRequest, NativeBlock(0xC0, 0)).code,
              Errors::DeviceNotConnected);
    EXPECT_TRUE(files->CloseFile(pipe));
    EXPECT_TRUE(files->CloseFile(main));
    EXPECT_FALSE(device->IsOpen());
    EXPECT_TRUE(files->CloseFile(fresh));
}

TEST_F(OverlappedFiles, RefuseHandlesThatNameNothing) {
    const auto stale = OpenPipe(Native::ReadPipe);
    EXPECT_TRUE(files->CloseFile(stale));
    const auto reopened = OpenPipe(Native::ReadPipe);
    EXPECT_NE(stale, reopened);
    Request request;
    const auto unused = reinterpret_cast<Platform::Handle>(reinterpret_cast<std::uintptr_t>(reopened) + 4);
    for (const auto handle :
         {stale, Platform::NoHandle, Platform::InvalidHandle(), request.event.Get(), unused}) {
        Bytes buffer(8);
        EXPECT_EQ(Read(handle, buffer).code, Errors::InvalidHandle) << handle;
        EXPECT_EQ(Write(handle, buffer).code, Errors::InvalidHandle) << handle;
        EXPECT_EQ(Control(handle, Native::ControlVendorRequest, NativeBlock(0xC0, 0)).code,
                  Errors::InvalidHandle)
            << handle;
        EXPECT_FALSE(files->CancelTransfers(handle));
        EXPECT_EQ(Platform::LastError(), Errors::InvalidHandle) << handle;
        EXPECT_FALSE(files->CloseFile(handle));
        EXPECT_EQ(Platform::LastError(), Errors::InvalidHandle) << handle;
    }
    EXPECT_FALSE(Platform::Close(reopened)) << "not a waitable object";
    EXPECT_EQ(Platform::Wait(reopened, 0), WaitResult::Failed);
    EXPECT_TRUE(files->CloseFile(reopened));
}

TEST_F(OverlappedFiles, CanBeMadeToFail) {
    const auto main = Open("native/port1");
    const auto pipe = OpenPipe(Native::ReadPipe);
    const std::pair<const char*, std::function<bool()>> calls[] = {
        {"Open", [&] { return OpenError("native/port1") == Errors::Success; }},
        {"StartRead",
         [&] {
             Bytes b(1);
             return Read(pipe, b).code == Errors::Success;
         }},
        {"StartWrite", [&] { return Write(pipe, {1}).code == Errors::Success; }},
        {"StartControl",
         [&] { return Control(main, Native::ControlAbortPipe, NativeBlock(0, 0, 0x84)).code == 0; }},
        {"GetResult",
         [&] {
             Request request;
             return Result(pipe, request).code == Errors::Success;
         }},
        {"CancelTransfers", [&] { return files->CancelTransfers(pipe); }},
        {"CloseFile", [&] { return files->CloseFile(pipe); }},
    };
    for (const auto& [name, call] : calls) {
        std::vector<std::string> asked;
        Platform::InstallCallFilter([&, failing = std::string_view(name)](std::string_view asking) {
            return asking == failing ? Errors::NoSystemResources : Errors::Success;
        });
        EXPECT_FALSE(call()) << name;
        Platform::InstallCallFilter({});
        EXPECT_EQ(Platform::LastError(), Errors::NoSystemResources) << name;
    }
    EXPECT_TRUE(files->CloseFile(pipe)) << "the close that failed left the file open";
}

// A failure put into the question for the result must not pass for the end of the transfer.
TEST_F(OverlappedFiles, AFailingQuestionDoesNotReleaseTheBuffer) {
    device->LeaveToTest(In);
    const auto pipe = OpenPipe(Native::ReadPipe);
    Bytes buffer(8);
    Request request;
    StartPending(pipe, buffer, request);
    Platform::InstallCallFilter(
        [](std::string_view call) { return call == "GetResult" ? Errors::GeneralFailure : Errors::Success; });
    EXPECT_EQ(Result(pipe, request).code, Errors::IoIncomplete);
    device->Send(In, {1, 2, 3});
    EXPECT_EQ(Result(pipe, request, true), (Outcome{Errors::GeneralFailure, 3}));
    Platform::InstallCallFilter({});
}

TEST_F(OverlappedFiles, AllFilesLeftOpenAreClosedWithTheFileSystem) {
    device->LeaveToTest(In);
    const auto pipe = OpenPipe(Native::ReadPipe);
    Open("usbio/port1");
    Bytes buffer(8);
    Request request;
    StartPending(pipe, buffer, request);
    files.reset();
    EXPECT_FALSE(device->IsOpen());
    EXPECT_TRUE(request.TakeSignal());
}

TEST_F(OverlappedFiles, RunOutOfPlacesAndRecover) {
    std::vector<Platform::Handle> opened;
    for (Platform::Handle file; (file = files->Open("usbio/port1")) != Platform::InvalidHandle();) {
        opened.push_back(file);
    }
    EXPECT_EQ(Platform::LastError(), Errors::NoSystemResources);
    EXPECT_GE(opened.size(), 512u) << "four files on each of 127 instruments";
    EXPECT_TRUE(files->CloseFile(opened.front()));
    opened.front() = Open("usbio/port1");
    for (const auto file : opened) {
        EXPECT_TRUE(files->CloseFile(file));
    }
}

}  // namespace
}  // namespace Varnholt::Tests
