#include "Platform/Drivers/DriverFixture.h"

namespace Varnholt::Tests {
namespace {

using Protocol::BulkInEndpoint;

class NativeDriver : public DriverFixture {};

TEST_F(NativeDriver, ListsTheBusAndOpensWhatItsPathsName) {
    bus_.devices.emplace_back("port0", std::make_shared<HookedDevice>());
    using Paths = std::vector<std::string>;
    EXPECT_EQ(files_->ListInterfaces(Native::InterfaceClass), (Paths{"native/port1", "native/port0"}));
    EXPECT_EQ(files_->ListInterfaces(Protocol::UsbIoDriver::InterfaceClass),
              (Paths{"usbio/port1", "usbio/port0"}));
    EXPECT_EQ(files_->ListInterfaces(Protocol::Guid{}), Paths());
    for (const char* path : {"native/port1", "native/port1\\PIPE01", "native/port1\\PIPE02",
                             "native/port1\\PIPE03", "usbio/port0"}) {
        EXPECT_EQ(OpenError(path), 0U) << path;
    }
    for (const char* path : {"native/port1\\PIPE00", "native/port1\\PIPE04", "native/port1\\PIPE1",
                             "native/port1\\PIPE011", "native/port1\\pipe01", "native/port1\\",
                             "native/PORT1", "native/", "NATIVE/port1", "port1", "", "usbio/port1\\PIPE01"}) {
        EXPECT_EQ(OpenError(path), Errors::FileNotFound) << path;
    }
    EXPECT_EQ(device_->handles, 0);
}

TEST_F(NativeDriver, FilesShareOneClaimedDevice) {
    const auto main = Open("native/port1");
    const auto pipe = OpenPipe(1);
    EXPECT_EQ(std::pair(device_->opened, device_->claims), std::pair(1, 1));
    EXPECT_TRUE(files_->CloseFile(main));
    EXPECT_TRUE(device_->isClaimed);
    EXPECT_TRUE(files_->CloseFile(pipe));
    EXPECT_FALSE(device_->isClaimed);
    EXPECT_EQ(device_->handles, 0);
    for (const auto code : {Errors::Busy, Errors::AccessDenied, Errors::DeviceNotConnected}) {
        for (Platform::ErrorCode* const answer :
             {&device_->claimAnswer, &bus_.openAnswer, &device_->endpointsAnswer}) {
            *answer = code;
            EXPECT_EQ(OpenError("native/port1\\PIPE01"), code);
            *answer = Errors::Success;
            EXPECT_EQ(std::pair(device_->handles, device_->isClaimed), std::pair(0, false));
        }
    }
    EXPECT_EQ(OpenError("native/port1"), Errors::Success);
}

TEST_F(NativeDriver, IsNotOpenedAgainBeforeItHasClosed) {
    std::thread again;
    device_->onClose = [&] {
        again = std::thread([&] { Open("native/port1"); });
        Platform::SleepMilliseconds(20);
        EXPECT_EQ(device_->opened, 1);
    };
    EXPECT_TRUE(files_->CloseFile(Open("native/port1")));
    again.join();
}

TEST_F(NativeDriver, RefusesWhatAFileDoesNotTake) {
    constexpr std::uint32_t Vendor = Native::ControlVendorRequest, Abort = Native::ControlAbortPipe;
    const auto main = Open("native/port1");
    const auto good = NativeBlock(0xC0, 0);
    const std::vector<std::tuple<const char*, std::uint32_t, Bytes, std::size_t, Platform::ErrorCode>>
        controls{
            {"unknown code", 0x220005, good, 0, Errors::InvalidFunction},
            {"short block", Vendor, Bytes(9), 0, Errors::InvalidParameter},
            {"long block", Vendor, Bytes(11), 0, Errors::InvalidParameter},
            {"direction 2", Vendor, NativeBlock(0xC0, 2), 0, Errors::InvalidParameter},
            {"type 0", Vendor, NativeBlock(0xC0, 0, 0, 0, 0), 0, Errors::InvalidParameter},
            {"recipient 1", Vendor, NativeBlock(0xC0, 0, 0, 0, 2, 1), 0, Errors::InvalidParameter},
            {"data beyond a setup packet's length", Vendor, good, 65536, Errors::InvalidParameter},
            {"abort without a block", Abort, {}, 0, Errors::InvalidParameter},
            {"abort of an unknown endpoint", Abort, NativeBlock(0, 0, 0x85), 0, Errors::InvalidParameter},
            {"abort beyond a byte", Abort, NativeBlock(0, 0, 0x184), 0, Errors::InvalidParameter},
        };
    Bytes data(4);
    for (const auto& [name, code, input, outputSize, error] : controls) {
        Bytes output(outputSize);
        EXPECT_EQ(Control(main, code, input, output).code, error) << name;
    }
    for (const std::uint32_t pipe : {1U, 2U, 3U}) {
        EXPECT_EQ(Control(OpenPipe(pipe), Vendor, good).code, Errors::InvalidFunction) << pipe;
    }
    EXPECT_EQ(Read(main, data).code, Errors::InvalidFunction);
    EXPECT_EQ(Write(main, data).code, Errors::InvalidFunction);
    EXPECT_EQ(device_->submissions, 0);
}

TEST_F(NativeDriver, ButtonReportHasNoDataStage) {
    device_->AnswerAtOnce();
    Bytes undefined(8, 0x77);
    EXPECT_EQ(Control(Open("native/port1"), Native::ControlButtonReport, NativeBlock(0xD0, 0, 3), undefined),
              (Outcome{0, 0}));
    EXPECT_EQ(device_->last.setup, (Platform::Usb::SetupPacket{0x40, 0xD0, 3, 0, 0}));
}

TEST_F(NativeDriver, ClearsAHaltBeforeTheNextTransferOrTheEnd) {
    const Platform::Handle main = Open("native/port1"), readPipe = OpenPipe(1), writePipe = OpenPipe(2);
    const auto vendor = [&] { return Control(main, Native::ControlVendorRequest, NativeBlock(0xC0, 0)); };
    const Outcome failed{Errors::GeneralFailure, 0};
    Bytes buffer(8);
    device_->AnswerAtOnce(TransferStatus::Stalled, 0);
    EXPECT_EQ(Read(readPipe, buffer), failed);
    EXPECT_EQ(vendor(), failed);
    device_->AnswerAtOnce();
    EXPECT_EQ(Write(writePipe, {2}), (Outcome{0, 1}));
    EXPECT_EQ(vendor(), (Outcome{0, 0}));
    EXPECT_EQ(device_->clearedHalts, Bytes());
    device_->haltAnswer = Errors::GeneralFailure;
    EXPECT_EQ(Read(readPipe, buffer), failed) << "still halted";
    device_->haltAnswer = Errors::Success;
    EXPECT_EQ(Read(readPipe, buffer), (Outcome{0, 8}));
    EXPECT_EQ(Read(readPipe, buffer), (Outcome{0, 8}));
    EXPECT_EQ(device_->clearedHalts, (Bytes{BulkInEndpoint, BulkInEndpoint}));
    device_->AnswerAtOnce(TransferStatus::Stalled, 0);
    EXPECT_EQ(Read(readPipe, buffer), failed);
    for (const Platform::Handle file : {main, readPipe, writePipe}) {
        EXPECT_TRUE(files_->CloseFile(file));
    }
    EXPECT_EQ(device_->clearedHalts, Bytes(3, BulkInEndpoint));
}

}  // namespace
}  // namespace Varnholt::Tests
