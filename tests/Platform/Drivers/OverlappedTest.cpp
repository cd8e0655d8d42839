#include <atomic>
#include <thread>

#include "Platform/Drivers/DriverFixture.h"
#include "Platform/OverlappedRequest.h"
#include "Support/FailCalls.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;

constexpr auto Complete = &HookedDevice::Complete;

/// What holds for every file, whichever driver stands behind it.
class OverlappedFiles : public DriverFixture {
  protected:
    Platform::Handle pipe_ = OpenPipe(Native::ReadPipe);
    Bytes buffer_ = Bytes(8);
    Request request_;
};

TEST_F(OverlappedFiles, SignalAtCompletionAndResetAtStart) {
    Platform::SignalEvent(request_.event.Get());
    StartPending(pipe_, buffer_, request_);
    EXPECT_FALSE(request_.TakeSignal()) << "a signal from before the start";
    EXPECT_EQ(Result(pipe_, request_), (Outcome{Errors::IoIncomplete, 0}));
    Bytes other(8);
    EXPECT_EQ(ErrorOf(StartRead(pipe_, other, request_)), Errors::InvalidParameter) << "its record runs";
    device_->Send(In, {1, 2, 3});
    EXPECT_EQ(Platform::Wait(request_.event.Get(), 1000), WaitResult::Signalled);
    EXPECT_EQ(Result(pipe_, request_), (Outcome{0, 3}));
    EXPECT_EQ(Result(pipe_, request_), (Outcome{0, 3})) << "asking does not change the record";
    EXPECT_FALSE(request_.TakeSignal()) << "signalled twice";
    EXPECT_EQ(std::pair(buffer_[2], other), std::pair(std::uint8_t{3}, Bytes(8)));

    device_->AnswerAtOnce(TransferStatus::Completed, 1);
    EXPECT_TRUE(StartRead(pipe_, buffer_, request_)) << "completed inside the start";
    EXPECT_TRUE(request_.TakeSignal());
    EXPECT_EQ(Result(pipe_, request_), (Outcome{0, 1}));
}

TEST_F(OverlappedFiles, RequestsEndBeforeTheyStartAnew) {
    const ScopedDeviceFiles inForce(*files_);
    OverlappedRequest request(request_.event.Get());
    Bytes other(8);
    for (Bytes* const buffer : {&buffer_, &other}) {
        EXPECT_EQ(ErrorOf(request.Start(pipe_, Operation::Read(buffer->data(), 8))), Errors::IoPending);
    }
    device_->Send(In, {7});
    std::uint32_t moved = 0;
    EXPECT_TRUE(request.GetResult(moved, true));
    EXPECT_EQ(std::pair(moved, other[0]), std::pair(1U, std::uint8_t{7}));
}

TEST_F(OverlappedFiles, ARequestThatHasFailedEndsWithoutCancellingOthers) {
    const ScopedDeviceFiles inForce(*files_);
    OverlappedRequest going(request_.event.Get());
    Bytes other(8);
    {
        const Request record;
        OverlappedRequest failed(record.event.Get());
        Transfer* transfer = nullptr;
        device_->onSubmit = [&](Transfer& submitted) {
            transfer = &submitted;
            return Errors::Success;
        };
        failed.Start(pipe_, Operation::Read(buffer_.data(), 8));
        device_->onSubmit = {};
        going.Start(pipe_, Operation::Read(other.data(), 8));
        Complete(*transfer, TransferStatus::Stalled, 0);
        SetLastError(Errors::Busy);
    }
    EXPECT_EQ(LastError(), Errors::Busy) << "the end of a request is no call of its own";
    EXPECT_EQ(device_->cancellations, 0);
}

TEST_F(OverlappedFiles, CancelOnlyWhatTheCallerStartedOnTheFile) {
    const Platform::Handle files[] = {pipe_, pipe_, OpenPipe(1), OpenPipe(3)};
    Bytes buffers[4] = {Bytes(8), Bytes(8), Bytes(8), Bytes(8)};
    Request requests[4];
    std::thread([&] { StartPending(pipe_, buffers[1], requests[1]); }).join();
    for (const std::size_t own : {0U, 2U, 3U}) {
        StartPending(files[own], buffers[own], requests[own]);
    }
    EXPECT_TRUE(files_->CancelTransfers(pipe_));
    EXPECT_EQ(Result(pipe_, requests[0], true), (Outcome{Errors::OperationAborted, 0}));
    for (const std::size_t other : {1U, 2U, 3U}) {
        EXPECT_EQ(Result(files[other], requests[other]).code, Errors::IoIncomplete) << other;
    }
    EXPECT_TRUE(files_->CancelTransfers(pipe_)) << "nothing left to cancel";
    files_.reset();
    EXPECT_EQ(device_->handles, 0) << "all files left open are closed with the file system";
    EXPECT_TRUE(requests[3].TakeSignal());
}

TEST_F(OverlappedFiles, RefuseHandlesThatNameNothing) {
    const auto stale = pipe_;
    EXPECT_TRUE(files_->CloseFile(stale));
    const auto reopened = OpenPipe(Native::ReadPipe);
    EXPECT_NE(stale, reopened);
    const auto unused = reinterpret_cast<Platform::Handle>(reinterpret_cast<std::uintptr_t>(reopened) + 4);
    for (const auto handle :
         {stale, Platform::NoHandle, Platform::InvalidHandle(), request_.event.Get(), unused}) {
        SCOPED_TRACE(handle);
        EXPECT_EQ(Read(handle, buffer_).code, Errors::InvalidHandle);
        EXPECT_EQ(Write(handle, buffer_).code, Errors::InvalidHandle);
        EXPECT_EQ(Control(handle, Native::ControlVendorRequest, NativeBlock(0xC0, 0)).code,
                  Errors::InvalidHandle);
        EXPECT_EQ(ErrorOf(files_->CancelTransfers(handle)), Errors::InvalidHandle);
        EXPECT_EQ(ErrorOf(files_->CloseFile(handle)), Errors::InvalidHandle);
    }
    EXPECT_EQ(ErrorOf(files_->Start(reopened, Platform::Operation::Read(nullptr, 1), request_.record)),
              Errors::InvalidParameter);
    EXPECT_FALSE(Platform::Close(reopened)) << "not a waitable object";
    EXPECT_EQ(Platform::Wait(reopened, 0), WaitResult::Failed);
}

// A failure put into the question for the result must not pass for the end of the transfer, nor one of the
// signal keep anybody waiting.
TEST_F(OverlappedFiles, FailuresPutInNeitherReleaseTheBufferNorKeepTheSignal) {
    StartPending(pipe_, buffer_, request_);
    FailCalls("GetResult", Errors::GeneralFailure);
    EXPECT_EQ(Result(pipe_, request_).code, Errors::IoIncomplete);
    device_->Send(In, {1, 2, 3});
    EXPECT_EQ(Result(pipe_, request_, true), (Outcome{Errors::GeneralFailure, 3}));

    FailCalls("SignalEvent", Errors::GeneralFailure, 1);
    StartPending(pipe_, buffer_, request_);
    EXPECT_EQ(request_.record.internalHigh, 0u) << "nothing has moved yet";
    device_->Send(In, {1});
    Platform::InstallCallFilter({});
    EXPECT_TRUE(request_.TakeSignal());
}

// Every order in which acceptance, cancellation and completion of one read can meet.
TEST_F(OverlappedFiles, EndOnceInEveryOrder) {
    // In the submission it is cancelled (c), done (d), refused (r). A cancellation that ends it does so with
    // three bytes, as soon as the device is told.
    const auto main = Open("native/port1");
    for (const auto& [name, inSubmit, endedByCancel, outcome, cancels] :
         std::vector<std::tuple<const char*, std::string, bool, Outcome, int>>{
             {"completed in submit", "d", false, {0, 8}, 0},
             {"cancelled before it was accepted", "c", true, {Errors::OperationAborted, 3}, 1},
             {"cancelled, then completed, in submit", "cd", false, {0, 8}, 0},
             {"cancelled, then refused", "cr", false, {Errors::GeneralFailure, 0}, 0},
             {"cancelled before accepted, completed later", "c", false, {0, 8}, 1},
         }) {
        SCOPED_TRACE(name);
        const bool refused = inSubmit.ends_with('r');
        const bool atOnce = inSubmit.ends_with('d');
        Transfer* running = nullptr;
        device_->cancellations = 0;
        device_->onSubmit = [&](Transfer& transfer) {
            if (inSubmit.starts_with('c')) {
                Control(main, Protocol::NativeDriver::ControlAbortPipe,
                        NativeBlock(0, 0, Protocol::BulkInEndpoint));
            }
            if (refused) {
                return Errors::GeneralFailure;
            }
            if (atOnce) {
                Complete(transfer, TransferStatus::Completed, 8);
            } else {
                running = &transfer;
            }
            return Errors::Success;
        };
        device_->onCancel = [&](Transfer& transfer) {
            EXPECT_EQ(&transfer, running) << "cancelled what the device does not have";
            if (endedByCancel) {
                running = nullptr;
                Complete(transfer, TransferStatus::Cancelled, 3);
            }
        };
        Request request;
        EXPECT_EQ(StartRead(pipe_, buffer_, request), atOnce);
        EXPECT_TRUE(atOnce || Platform::LastError() == (refused ? outcome.code : Errors::IoPending))
            << Platform::LastError();
        if (running != nullptr) {
            Complete(*running, TransferStatus::Completed, 8);
        }
        EXPECT_EQ(Result(pipe_, request), outcome);
        EXPECT_EQ(request.TakeSignal(), !refused);
        EXPECT_FALSE(request.TakeSignal()) << "signalled twice";
        EXPECT_EQ(device_->cancellations, cancels);
    }
}

// The device may still be looking at a transfer that it has completed: the cancellation must return first.
TEST_F(OverlappedFiles, CloseAfterACancellationUnderWay) {
    std::atomic<bool> closed{false};
    std::thread closer;
    device_->onCancel = [&](Transfer& transfer) {
        Complete(transfer, TransferStatus::Cancelled, 0);
        closer = std::thread([&] {
            EXPECT_TRUE(files_->CloseFile(pipe_));
            closed = true;
        });
        Platform::SleepMilliseconds(20);
        EXPECT_FALSE(closed);
    };
    StartPending(pipe_, buffer_, request_);
    EXPECT_TRUE(files_->CancelTransfers(pipe_));
    closer.join();
    EXPECT_EQ(device_->cancellations, 1);
    EXPECT_TRUE(request_.TakeSignal());
}

// As they do for a host that forgets to close them.
TEST_F(OverlappedFiles, RunOutOfPlacesAndRecover) {
    std::vector<Platform::Handle> opened;
    for (Platform::Handle file; (file = files_->Open("usbio/port1")) != Platform::InvalidHandle();) {
        opened.push_back(file);
    }
    EXPECT_EQ(Platform::LastError(), Errors::NoSystemResources);
    EXPECT_EQ(opened.size() + 1, 1024U) << "more than four files on each of 127 instruments";
    EXPECT_TRUE(files_->CloseFile(opened.front()));
    Open("usbio/port1");
}

}  // namespace
}  // namespace Varnholt::Tests
