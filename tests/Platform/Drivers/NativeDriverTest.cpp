#include "Platform/Drivers/DriverFixture.h"

namespace Varnholt::Tests {
namespace {

namespace Errors = Platform::Errors;
namespace Native = Protocol::NativeDriver;
using Platform::Usb::TransferStatus;

class NativeDriver : public DriverFixture {};

TEST_F(NativeDriver, OpensWhatItsPathsName) {
    const struct {
        const char* path;
        Platform::ErrorCode error;
    } cases[] = {
        {"native/port1", Errors::Success},
        {"native/port1\\PIPE01", Errors::Success},
        {"native/port1\\PIPE02", Errors::Success},
        {"native/port1\\PIPE03", Errors::Success},
        {"native/port1\\PIPE00", Errors::FileNotFound},
        {"native/port1\\PIPE04", Errors::FileNotFound},
        {"native/port1\\PIPE1", Errors::FileNotFound},
        {"native/port1\\PIPE011", Errors::FileNotFound},
        {"native/port1\\pipe01", Errors::FileNotFound},
        {"native/port1\\", Errors::FileNotFound},
        {"native/PORT1", Errors::FileNotFound},
        {"native/port2", Errors::FileNotFound},
        {"native/", Errors::FileNotFound},
        {"NATIVE/port1", Errors::FileNotFound},
        {"port1", Errors::FileNotFound},
        {"", Errors::FileNotFound},
        {"usbio/port1\\PIPE01", Errors::FileNotFound},
    };
    for (const auto& row : cases) {
        EXPECT_EQ(OpenError(row.path), row.error) << row.path;
    }
    EXPECT_FALSE(device_->IsOpen());
}

TEST_F(NativeDriver, ListsTheBus) {
    bus_.Plug("port0", std::make_shared<ScriptedUsbDevice>());
    EXPECT_EQ(files_->ListInterfaces(Native::InterfaceClass),
              (std::vector<std::string>{"native/port1", "native/port0"}));
    EXPECT_EQ(files_->ListInterfaces(Protocol::UsbIoDriver::InterfaceClass),
              (std::vector<std::string>{"usbio/port1", "usbio/port0"}));
    EXPECT_TRUE(files_->ListInterfaces(Protocol::Guid{}).empty());
}

TEST_F(NativeDriver, FilesShareOneClaimedDevice) {
    const auto main = Open("native/port1");
    const auto pipe = OpenPipe(1);
    EXPECT_EQ(device_->TimesOpened(), 1u);
    EXPECT_EQ(device_->TimesClaimed(), 1u);
    EXPECT_TRUE(files_->CloseFile(main));
    EXPECT_TRUE(device_->IsClaimed());
    EXPECT_TRUE(files_->CloseFile(pipe));
    EXPECT_FALSE(device_->IsClaimed());
    EXPECT_FALSE(device_->IsOpen());
}

TEST_F(NativeDriver, OpenPassesOnWhyTheDeviceCannotBeHad) {
    for (const auto code : {Errors::Busy, Errors::AccessDenied, Errors::DeviceNotConnected}) {
        device_->AnswerClaim(code);
        EXPECT_EQ(OpenError("native/port1"), code);
        EXPECT_FALSE(device_->IsOpen());
        device_->AnswerClaim(Errors::Success);
        bus_.AnswerOpen(code);
        EXPECT_EQ(OpenError("native/port1"), code);
        bus_.AnswerOpen(Errors::Success);
        device_->AnswerEndpoints(code);
        EXPECT_EQ(OpenError("native/port1\\PIPE01"), code);
        device_->AnswerEndpoints(Errors::Success);
    }
    EXPECT_EQ(OpenError("native/port1"), Errors::Success);
}

TEST_F(NativeDriver, RefusesWhatAFileDoesNotTake) {
    const auto refused = [this](Platform::Handle file, std::uint32_t code, const Bytes& input,
                                std::size_t outputSize = 0) {
        Bytes output(outputSize);
        return Control(file, code, input, output).code;
    };
    const auto main = Open("native/port1");
    const auto good = NativeBlock(0xC0, 0);
    const struct {
        const char* name;
        std::uint32_t code;
        Bytes input;
        std::size_t outputSize;
        Platform::ErrorCode error;
    } controls[] = {
        {"unknown code", 0x220005, good, 0, Errors::InvalidFunction},
        {"a USBIO code", Protocol::UsbIoDriver::Control::GetDriverInfo, {}, 12, Errors::InvalidFunction},
        {"no block", Native::ControlVendorRequest, {}, 0, Errors::InvalidParameter},
        {"short block", Native::ControlVendorRequest, Bytes(9), 0, Errors::InvalidParameter},
        {"long block", Native::ControlVendorRequest, Bytes(11), 0, Errors::InvalidParameter},
        {"direction 2", Native::ControlVendorRequest, NativeBlock(0xC0, 2), 0, Errors::InvalidParameter},
        {"type 0", Native::ControlVendorRequest, NativeBlock(0xC0, 0, 0, 0, 0), 0, Errors::InvalidParameter},
        {"recipient 1", Native::ControlVendorRequest, NativeBlock(0xC0, 0, 0, 0, 2, 1), 0,
         Errors::InvalidParameter},
        {"data beyond a setup packet's length", Native::ControlVendorRequest, good, 65536,
         Errors::InvalidParameter},
        {"abort without a block", Native::ControlAbortPipe, {}, 0, Errors::InvalidParameter},
        {"abort of an unknown endpoint", Native::ControlAbortPipe, NativeBlock(0, 0, 0x85), 0,
         Errors::InvalidParameter},
        {"abort of an endpoint beyond a byte", Native::ControlAbortPipe, NativeBlock(0, 0, 0x184), 0,
         Errors::InvalidParameter},
    };
    for (const auto& row : controls) {
        EXPECT_EQ(refused(main, row.code, row.input, row.outputSize), row.error) << row.name;
    }
    Bytes data(4);
    for (std::uint32_t pipe = 1; pipe <= 3; ++pipe) {
        EXPECT_EQ(refused(OpenPipe(pipe), Native::ControlVendorRequest, good), Errors::InvalidFunction)
            << pipe;
    }
    EXPECT_EQ(Read(main, data).code, Errors::InvalidFunction);
    EXPECT_EQ(Write(main, data).code, Errors::InvalidFunction);
}

TEST_F(NativeDriver, ButtonReportHasNoDataStage) {
    device_->Expect({VendorOut(0xD0, {}, 3)});
    const auto main = Open("native/port1");
    Bytes undefined(8, 0x77);
    EXPECT_EQ(Control(main, Native::ControlButtonReport, NativeBlock(0xD0, 0, 3), undefined),
              (Outcome{0, 0}));
}

TEST_F(NativeDriver, ClearsAHaltBeforeTheNextTransferOrTheEnd) {
    device_->Expect({
        BulkOut({1}),
        BulkIn(8, {}).Ends(TransferStatus::Stalled),
        BulkOut({2}),
        VendorOut(0xC0, {}).Ends(TransferStatus::Stalled),
        VendorOut(0xC0, {}),
        HaltCleared(Protocol::BulkInEndpoint).Refused(Errors::GeneralFailure),
        HaltCleared(Protocol::BulkInEndpoint),
        BulkIn(8, Counting(8)),
        BulkIn(8, Counting(8)),
        BulkIn(8, {}).Ends(TransferStatus::Stalled),
        HaltCleared(Protocol::BulkInEndpoint),
    });
    const auto main = Open("native/port1");
    const auto readPipe = OpenPipe(Native::ReadPipe);
    const auto writePipe = OpenPipe(Native::WritePipe);
    const auto vendor = [&] { return Control(main, Native::ControlVendorRequest, NativeBlock(0xC0, 0)); };
    Bytes buffer(8);
    EXPECT_EQ(Write(writePipe, {1}), (Outcome{0, 1}));
    EXPECT_EQ(Read(readPipe, buffer), (Outcome{Errors::GeneralFailure, 0}));
    EXPECT_EQ(Write(writePipe, {2}), (Outcome{0, 1}));
    EXPECT_EQ(vendor(), (Outcome{Errors::GeneralFailure, 0}));
    EXPECT_EQ(vendor(), (Outcome{0, 0}));
    EXPECT_EQ(Read(readPipe, buffer), (Outcome{Errors::GeneralFailure, 0})) << "still halted";
    EXPECT_EQ(Read(readPipe, buffer), (Outcome{0, 8}));
    EXPECT_EQ(Read(readPipe, buffer), (Outcome{0, 8}));
    EXPECT_EQ(Read(readPipe, buffer), (Outcome{Errors::GeneralFailure, 0}));
    for (const Platform::Handle file : {main, readPipe, writePipe}) {
        EXPECT_TRUE(files_->CloseFile(file));
    }
}

}  // namespace
}  // namespace Varnholt::Tests
