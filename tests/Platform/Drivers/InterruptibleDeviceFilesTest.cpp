#include <gtest/gtest.h>

#include "Platform/Drivers/DriverFixture.h"
#include "Platform/InterruptibleDeviceFiles.h"
#include "Support/TestClock.h"

namespace Varnholt::Tests {
namespace {

namespace Errors = Platform::Errors;
namespace Status = Protocol::UsbIoDriver::Status;
using Platform::InterruptibleDeviceFiles;
using Protocol::BulkInEndpoint;
using Protocol::BulkOutEndpoint;
using Protocol::InterruptInEndpoint;

/// The drivers' files with the interruptible ones in front of them.
class InterruptibleDeviceFilesTest : public DriverFixture {
  protected:
    InterruptibleDeviceFilesTest() {
        for (const std::uint8_t endpoint : {BulkInEndpoint, InterruptInEndpoint}) {
            device->LeaveToTest(endpoint);
        }
        drivers = std::move(files);
        auto inFront = std::make_unique<InterruptibleDeviceFiles>(*drivers);
        interruptible = inFront.get();
        files = std::move(inFront);
    }
    ~InterruptibleDeviceFilesTest() override { files.reset(); }

    TestClock clock{TestTime::Virtual};
    std::unique_ptr<Platform::DeviceFileSystem> drivers;
    InterruptibleDeviceFiles* interruptible = nullptr;
};

TEST_F(InterruptibleDeviceFilesTest, NothingStartsUntilItIsResumed) {
    const Platform::Handle control = Open("native/port1");
    const Platform::Handle pipe = OpenPipe(1);
    interruptible->Interrupt();
    Bytes buffer(16);
    Request request;
    EXPECT_FALSE(StartRead(pipe, buffer, request));
    EXPECT_EQ(Platform::LastError(), Errors::OperationAborted);
    const Bytes reset = NativeBlock(0xCA, 0);
    EXPECT_FALSE(files->StartControl(control, Protocol::NativeDriver::ControlVendorRequest, reset.data(),
                                     static_cast<std::uint32_t>(reset.size()), nullptr, 0, request.record));
    EXPECT_EQ(Platform::LastError(), Errors::OperationAborted);
    EXPECT_TRUE(request.TakeSignal()) << "nobody must wait for what is refused";
    interruptible->Resume();
    StartPending(pipe, buffer, request);
    device->Send(BulkInEndpoint, Counting(16));
    EXPECT_EQ(Result(pipe, request), (Outcome{Errors::Success, 16}));
    EXPECT_EQ(buffer, Counting(16));
    EXPECT_TRUE(files->CloseFile(pipe));
    EXPECT_TRUE(files->CloseFile(control));
}

TEST_F(InterruptibleDeviceFilesTest, FilesAndTransfersThatAreGoneAreLeftAlone) {
    const Platform::Handle pipe = OpenPipe(1);
    Bytes buffer(16);
    {
        Request request;
        StartPending(pipe, buffer, request);
        device->Send(BulkInEndpoint, Counting(16));
        EXPECT_EQ(Result(pipe, request), (Outcome{Errors::Success, 16}));
    }
    interruptible->Interrupt();
    EXPECT_TRUE(files->CloseFile(pipe));
    interruptible->Interrupt();
}

TEST_F(InterruptibleDeviceFilesTest, TellsOfTheDataThatTheThreadReads) {
    const Platform::Handle control = Open("native/port1");
    const Platform::Handle pipe = OpenPipe(1);
    std::vector<std::uint32_t> told;
    interruptible->ObserveReads([&told](std::uint32_t bytes) { told.push_back(bytes); });
    for (const std::size_t size : {16u, 7u, 0u}) {
        Bytes buffer(16);
        Request request;
        StartPending(pipe, buffer, request);
        EXPECT_EQ(Result(pipe, request).code, Errors::IoIncomplete);
        device->Send(BulkInEndpoint, Counting(size));
        EXPECT_EQ(Result(pipe, request).bytes, size);
        EXPECT_EQ(Result(pipe, request).bytes, size) << "asked again";
    }
    EXPECT_EQ(told, (std::vector<std::uint32_t>{16, 7})) << "each once, and nothing of nothing";
    interruptible->ObserveReads({});
    EXPECT_TRUE(files->CloseFile(pipe));
    EXPECT_TRUE(files->CloseFile(control));
}

}  // namespace
}  // namespace Varnholt::Tests
