#include <atomic>
#include <new>
#include <string>
#include <thread>

#include "Platform/Drivers/DriverFixture.h"
#include "Platform/Threads.h"

namespace Varnholt::Tests {
namespace {

namespace Errors = Platform::Errors;

constexpr auto Complete = &HookedDevice::Complete;

/// One read, with events placed inside one another.
class RequestOrder : public DriverFixture {
  protected:
    const Platform::Handle pipe_ = OpenPipe(1);
    Bytes buffer_ = Bytes(8);
};

// Every order in which acceptance, cancellation and completion of one read can meet.
TEST_F(RequestOrder, EndsOnceInEveryOrder) {
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
TEST_F(RequestOrder, ClosingWaitsForACancellationUnderWay) {
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
    Request request;
    StartPending(pipe_, buffer_, request);
    EXPECT_TRUE(files_->CancelTransfers(pipe_));
    closer.join();
    EXPECT_EQ(device_->cancellations, 1);
    EXPECT_TRUE(request.TakeSignal());
}

// A failure that is known at once is still the result of a request that was started.
TEST_F(RequestOrder, AFailureInsideTheStartIsAResult) {
    device_->onSubmit = [](Transfer& transfer) {
        Complete(transfer, TransferStatus::IoError, 0xFFFF);
        return Errors::Success;
    };
    Request request;
    StartPending(pipe_, buffer_, request);
    EXPECT_TRUE(request.TakeSignal());
    EXPECT_EQ(Result(pipe_, request), (Outcome{Errors::GeneralFailure, 8})) << "no more than was asked for";

    device_->onSubmit = [](Transfer&) -> Platform::ErrorCode { throw std::bad_alloc(); };
    EXPECT_EQ(Read(pipe_, buffer_).code, Errors::NotEnoughMemory);
    EXPECT_TRUE(files_->CloseFile(pipe_)) << "nothing is left running";
}

}  // namespace
}  // namespace Varnholt::Tests
