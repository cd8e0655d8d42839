#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <memory>
#include <new>
#include <string>
#include <thread>

#include "Platform/Drivers/DriverFixture.h"
#include "Platform/Threads.h"

namespace Varnholt::Tests {
namespace {

namespace Errors = Platform::Errors;
namespace Native = Protocol::NativeDriver;
using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;

constexpr std::uint8_t In = Protocol::BulkInEndpoint;

/// A device whose `Submit` and `Cancel` do what a test says, to place one event inside another.
class HookedDevice final : public Platform::Usb::UsbDevice {
  public:
    std::function<Platform::ErrorCode(Transfer&)> onSubmit;
    std::function<void(Transfer&)> onCancel;
    int cancels = 0;

    std::vector<Platform::Usb::EndpointInfo> Endpoints(Platform::ErrorCode& error) override {
        error = Errors::Success;
        return {{In, 2, 512}};
    }
    Platform::ErrorCode Claim() override { return Errors::Success; }
    void Release() override {}
    Platform::ErrorCode Submit(Transfer& transfer) override { return onSubmit(transfer); }
    void Cancel(Transfer& transfer) override {
        ++cancels;
        onCancel(transfer);
    }
    Platform::ErrorCode ClearHalt(std::uint8_t) override { return Errors::Success; }

    static void Complete(Transfer& transfer, TransferStatus status, std::uint32_t moved) {
        transfer.status = status;
        transfer.actualLength = moved;
        transfer.client->TransferCompleted(transfer);
    }
};

class HookedBus final : public Platform::Usb::UsbBus {
  public:
    std::shared_ptr<HookedDevice> device = std::make_shared<HookedDevice>();
    std::vector<std::string> List() override { return {"port1"}; }
    std::shared_ptr<Platform::Usb::UsbDevice> Open(const std::string&, Platform::ErrorCode&) override {
        return device;
    }
};

// Every order in which acceptance, cancellation and completion of one read can meet.
TEST(RequestOrder, EndsOnceInEveryOrder) {
    constexpr auto Complete = &HookedDevice::Complete;
    struct Case {
        const char* name;
        std::string inSubmit;  ///< what happens there: c cancelled, d done, r refused
        bool endedByCancel;    ///< as soon as the device is told of it, with three bytes
        Outcome outcome;
        int cancels;
    };
    const Case cases[] = {
        {"completed in submit", "d", false, {0, 8}, 0},
        {"cancelled before it was accepted", "c", true, {Errors::OperationAborted, 3}, 1},
        {"cancelled, then completed, in submit", "cd", false, {0, 8}, 0},
        {"cancelled, then refused", "cr", false, {Errors::GeneralFailure, 0}, 0},
        {"cancelled before accepted, completed later", "c", false, {0, 8}, 1},
    };
    for (const Case& row : cases) {
        SCOPED_TRACE(row.name);
        const bool refused = row.inSubmit.ends_with('r');
        const bool atOnce = row.inSubmit.ends_with('d');
        HookedBus bus;
        const auto files = Platform::Drivers::MakeDriverFileSystem(bus);
        const auto main = files->Open("native/port1");
        const auto pipe = files->Open("native/port1\\PIPE01");
        Transfer* running = nullptr;
        bus.device->onSubmit = [&](Transfer& transfer) {
            if (row.inSubmit.starts_with('c')) {
                Request abort;
                const auto block = NativeBlock(0, 0, In);
                EXPECT_TRUE(files->StartControl(main, Native::ControlAbortPipe, block.data(), 10, nullptr, 0,
                                                abort.record));
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
        bus.device->onCancel = [&](Transfer& transfer) {
            EXPECT_EQ(&transfer, running) << "cancelled what the device does not have";
            if (row.endedByCancel) {
                running = nullptr;
                Complete(transfer, TransferStatus::Cancelled, 3);
            }
        };
        Bytes buffer(8);
        Request request;
        EXPECT_EQ(files->StartRead(pipe, buffer.data(), 8, request.record), atOnce);
        EXPECT_TRUE(atOnce || Platform::LastError() == (refused ? row.outcome.code : Errors::IoPending))
            << Platform::LastError();
        if (running != nullptr) {
            Complete(*running, TransferStatus::Completed, 8);
        }
        std::uint32_t moved = 0;
        const bool succeeded = files->GetResult(pipe, request.record, moved, false);
        EXPECT_EQ((Outcome{succeeded ? 0 : Platform::LastError(), moved}), row.outcome);
        EXPECT_EQ(request.TakeSignal(), !refused);
        EXPECT_FALSE(request.TakeSignal()) << "signalled twice";
        EXPECT_EQ(bus.device->cancels, row.cancels);
        EXPECT_TRUE(files->CloseFile(pipe));
        EXPECT_TRUE(files->CloseFile(main));
    }
}

// The device may still be looking at a transfer that it has completed: the cancellation must return first.
TEST(RequestOrder, ClosingWaitsForACancellationUnderWay) {
    HookedBus bus;
    const auto files = Platform::Drivers::MakeDriverFileSystem(bus);
    const auto pipe = files->Open("native/port1\\PIPE01");
    std::atomic<bool> closed{false};
    std::thread closer;
    bus.device->onSubmit = [](Transfer&) { return Errors::Success; };
    bus.device->onCancel = [&](Transfer& transfer) {
        HookedDevice::Complete(transfer, TransferStatus::Cancelled, 0);
        closer = std::thread([&] {
            EXPECT_TRUE(files->CloseFile(pipe));
            closed = true;
        });
        Platform::SleepMilliseconds(20);
        EXPECT_FALSE(closed);
    };
    Bytes buffer(8);
    Request request;
    EXPECT_FALSE(files->StartRead(pipe, buffer.data(), 8, request.record));
    EXPECT_TRUE(files->CancelTransfers(pipe));
    closer.join();
    EXPECT_EQ(bus.device->cancels, 1);
    EXPECT_TRUE(request.TakeSignal());
}

// A failure that is known at once is still the result of a request that was started.
TEST(RequestOrder, AFailureInsideTheStartIsAResult) {
    HookedBus bus;
    const auto files = Platform::Drivers::MakeDriverFileSystem(bus);
    const auto pipe = files->Open("native/port1\\PIPE01");
    bus.device->onSubmit = [](Transfer& transfer) {
        HookedDevice::Complete(transfer, TransferStatus::IoError, 0xFFFF);
        return Errors::Success;
    };
    Bytes buffer(8);
    Request request;
    EXPECT_FALSE(files->StartRead(pipe, buffer.data(), 8, request.record));
    EXPECT_EQ(Platform::LastError(), Errors::IoPending);
    EXPECT_TRUE(request.TakeSignal());
    std::uint32_t moved = 0;
    EXPECT_FALSE(files->GetResult(pipe, request.record, moved, false));
    EXPECT_EQ(Platform::LastError(), Errors::GeneralFailure);
    EXPECT_EQ(moved, 8u) << "never more than was asked for";

    bus.device->onSubmit = [](Transfer&) -> Platform::ErrorCode { throw std::bad_alloc(); };
    EXPECT_FALSE(files->StartRead(pipe, buffer.data(), 8, request.record));
    EXPECT_EQ(Platform::LastError(), Errors::NotEnoughMemory);
    EXPECT_TRUE(files->CloseFile(pipe)) << "nothing is left running";
}

}  // namespace
}  // namespace Varnholt::Tests
