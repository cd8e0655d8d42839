// What the instrument's own driver and the USBIO driver have in common, each with its own controls and codes.
#include "Platform/Drivers/DriverFixture.h"
#include "Service/InterruptibleDeviceFiles.h"

namespace Varnholt::Tests {
namespace {

namespace Errors = Platform::Errors;
namespace Native = Protocol::NativeDriver;
namespace UsbIo = Protocol::UsbIoDriver;
using Platform::ErrorCode;
using Platform::Handle;
using Platform::Usb::TransferStatus;
using Protocol::BulkInEndpoint;
using Protocol::BulkOutEndpoint;
using Protocol::InterruptInEndpoint;

enum class Kind { Native, UsbIo };

class EitherDriver : public DriverFixture, public testing::WithParamInterface<Kind> {
  protected:
    bool IsNative() const { return GetParam() == Kind::Native; }
    ErrorCode Code(ErrorCode native, ErrorCode usbIo) const { return IsNative() ? native : usbIo; }
    ErrorCode CodeOfAbort() const { return Code(Errors::OperationAborted, UsbIo::Status::Cancelled); }

    Handle OpenEndpoint(std::uint8_t endpoint) {
        if (!IsNative()) {
            return OpenBound(endpoint);
        }
        return OpenPipe(endpoint == BulkInEndpoint    ? Native::ReadPipe
                        : endpoint == BulkOutEndpoint ? Native::WritePipe
                                                      : Native::InterruptPipe);
    }
    /// A file that takes vendor requests.
    Handle OpenMain() { return IsNative() ? Open("native/port1") : OpenBound(BulkOutEndpoint); }
    Outcome Vendor(Handle file, std::uint8_t request, bool in, Bytes& data, std::uint16_t value = 0,
                   std::uint16_t index = 0) {
        if (IsNative()) {
            return Control(file, Native::ControlVendorRequest, NativeBlock(request, in, value, index), data);
        }
        return Control(file,
                       in ? UsbIo::Control::ClassOrVendorInRequest : UsbIo::Control::ClassOrVendorOutRequest,
                       RequestBlock(request, value, index), data);
    }
};
INSTANTIATE_TEST_SUITE_P(, EitherDriver, testing::Values(Kind::Native, Kind::UsbIo),
                         [](const auto& parameter) {
                             return parameter.param == Kind::Native ? "Native" : "UsbIo";
                         });

TEST_P(EitherDriver, CarriesVendorRequests) {
    device_->Expect({
        VendorOut(0xC0, {}),
        VendorOut(0xC1, Counting(8), 0x1234, 0xABCD),
        VendorOut(0xA0, Counting(65535), 0x2000),
        VendorIn(0xC2, 8, Counting(8, 1)),
        VendorIn(0xD1, 6, {9, 8}),
    });
    const auto file = OpenMain();
    Bytes none, few = Counting(8), most = Counting(65535), answer(8), room(6, 0x55);
    EXPECT_EQ(Vendor(file, 0xC0, false, none), (Outcome{0, 0}));
    EXPECT_EQ(Vendor(file, 0xC1, false, few, 0x1234, 0xABCD), (Outcome{0, 8}));
    EXPECT_EQ(Vendor(file, 0xA0, false, most, 0x2000), (Outcome{0, 65535}));
    EXPECT_EQ(Vendor(file, 0xC2, true, answer), (Outcome{0, 8}));
    EXPECT_EQ(answer, Counting(8, 1));
    EXPECT_EQ(Vendor(file, 0xD1, true, room), (Outcome{0, 2}));
    EXPECT_EQ(room, (Bytes{9, 8, 0x55, 0x55, 0x55, 0x55}));
}

TEST_P(EitherDriver, HasAFileForEachEndpoint) {
    device_->Expect({
        BulkIn(65536, Counting(65536)),
        BulkOut(Counting(256, 7)),
        BulkOut({0}),
        BulkOut({}),
        BulkIn(512, Counting(100)),
        BulkIn(8, {0x42}, InterruptInEndpoint),
    });
    const auto in = OpenEndpoint(BulkInEndpoint);
    const auto out = OpenEndpoint(BulkOutEndpoint);
    const auto interrupt = OpenEndpoint(InterruptInEndpoint);
    Bytes buffer(65536), none;
    EXPECT_EQ(Read(in, buffer), (Outcome{0, 65536}));
    EXPECT_EQ(buffer, Counting(65536));
    EXPECT_EQ(Write(out, Counting(256, 7)), (Outcome{0, 256}));
    EXPECT_EQ(Write(out, {0}), (Outcome{0, 1}));
    EXPECT_EQ(Write(out, {}), (Outcome{0, 0})) << "an empty packet";
    EXPECT_EQ(Read(in, none), (Outcome{0, 0})) << "nothing to ask the device for";
    buffer.assign(512, 0);
    EXPECT_EQ(Read(in, buffer), (Outcome{0, 100}));
    buffer.assign(8, 0);
    EXPECT_EQ(Read(interrupt, buffer), (Outcome{0, 1}));
    EXPECT_EQ(buffer[0], 0x42);
    const ErrorCode refused = Code(Errors::InvalidFunction, UsbIo::Status::InvalidDirection);
    EXPECT_EQ(Write(in, buffer).code, refused);
    EXPECT_EQ(Write(interrupt, buffer).code, refused);
    EXPECT_EQ(Read(out, buffer).code, refused);
}

TEST_P(EitherDriver, AbortEndsTheTransfersOfTheEndpoint) {
    device_->LeaveToTest(BulkInEndpoint);
    device_->LeaveToTest(InterruptInEndpoint);
    const auto main = OpenMain();
    const auto in = OpenEndpoint(BulkInEndpoint);
    const auto interrupt = OpenEndpoint(InterruptInEndpoint);
    Bytes buffers[3] = {Bytes(8), Bytes(8), Bytes(8)}, undefined(8, 0x77);
    Request aborted[2], other;
    StartPending(in, buffers[0], aborted[0]);
    StartPending(in, buffers[1], aborted[1]);
    StartPending(interrupt, buffers[2], other);
    EXPECT_EQ(IsNative() ? Control(main, Native::ControlAbortPipe, NativeBlock(0, 0, BulkInEndpoint, 0, 0),
                                   undefined)
                         : Control(in, UsbIo::Control::AbortPipe),
              (Outcome{0, 0}));
    EXPECT_EQ(Result(in, aborted[0], true), (Outcome{CodeOfAbort(), 0}));
    EXPECT_EQ(Result(in, aborted[1], true), (Outcome{CodeOfAbort(), 0}));
    EXPECT_EQ(Result(interrupt, other), (Outcome{Errors::IoIncomplete, 0}));
    device_->Send(InterruptInEndpoint, {1});
    EXPECT_EQ(Result(interrupt, other, true), (Outcome{0, 1}));
}

TEST_P(EitherDriver, AnInterruptionEndsAllTransfersAndLetsNoneStart) {
    device_->LeaveToTest(BulkInEndpoint);
    device_->LeaveToTest(InterruptInEndpoint);
    const auto drivers = std::move(files_);
    auto interruptible = std::make_unique<Service::InterruptibleDeviceFiles>(*drivers);
    auto& inFront = *interruptible;
    files_ = std::move(interruptible);
    const Handle opened[] = {OpenMain(), OpenEndpoint(BulkInEndpoint), OpenEndpoint(InterruptInEndpoint)};
    Bytes buffers[3] = {Bytes(8), Bytes(8), Bytes(8)};
    Request requests[3];
    StartPending(opened[1], buffers[0], requests[0]);
    StartPending(opened[1], buffers[1], requests[1]);
    StartPending(opened[2], buffers[2], requests[2]);
    inFront.Interrupt();
    EXPECT_EQ(Result(opened[1], requests[0]), (Outcome{CodeOfAbort(), 0}));
    EXPECT_EQ(Result(opened[1], requests[1]), (Outcome{CodeOfAbort(), 0}));
    EXPECT_EQ(Result(opened[2], requests[2]), (Outcome{CodeOfAbort(), 0}));

    Request refused;
    EXPECT_FALSE(StartRead(opened[1], buffers[0], refused));
    EXPECT_EQ(Platform::LastError(), Errors::OperationAborted);
    EXPECT_TRUE(refused.TakeSignal()) << "nobody must wait for what is refused";
    EXPECT_FALSE(files_->StartControl(opened[0], 0, nullptr, 0, nullptr, 0, refused.record));
    EXPECT_EQ(Platform::LastError(), Errors::OperationAborted);
    inFront.Resume();
    StartPending(opened[1], buffers[0], requests[0]);
    device_->Send(BulkInEndpoint, {1, 2});
    EXPECT_EQ(Result(opened[1], requests[0]), (Outcome{0, 2}));
    for (const Handle file : opened) {
        EXPECT_TRUE(files_->CloseFile(file));
    }
    files_.reset();
}

TEST_P(EitherDriver, HasACodeForEveryOutcome) {
    const struct {
        TransferStatus status;
        ErrorCode native, usbIo;
    } cases[] = {
        {TransferStatus::Completed, Errors::Success, UsbIo::Status::Success},
        {TransferStatus::Stalled, Errors::GeneralFailure, UsbIo::Status::EndpointHalted},
        {TransferStatus::IoError, Errors::GeneralFailure, 0xE0000011},
        {TransferStatus::Overflow, Errors::GeneralFailure, UsbIo::Status::BabbleDetected},
        {TransferStatus::Cancelled, Errors::OperationAborted, UsbIo::Status::Cancelled},
        {TransferStatus::DeviceGone, Errors::DeviceNotConnected, UsbIo::Status::DeviceRemoved},
    };
    const auto main = OpenMain();
    const auto in = OpenEndpoint(BulkInEndpoint);
    for (const auto& row : cases) {
        SCOPED_TRACE(static_cast<int>(row.status));
        const ErrorCode code = Code(row.native, row.usbIo);
        Bytes buffer(16), data{1, 2};
        device_->Expect({VendorOut(0xC0, {1, 2}).Ends(row.status, 1)});
        EXPECT_EQ(Vendor(main, 0xC0, false, data), (Outcome{code, 1}));
        if (row.status == TransferStatus::DeviceGone) {
            break;  // nothing is asked of it any more
        }
        device_->Expect({BulkIn(16, Counting(16)).Ends(row.status, 5)});
        EXPECT_EQ(Read(in, buffer), (Outcome{code, 5}));
        EXPECT_EQ(buffer[4], 4) << "what has moved counts, whatever the end";
        if (row.status == TransferStatus::Stalled) {
            device_->Expect({HaltCleared(BulkInEndpoint), BulkIn(16, Counting(16))});
            EXPECT_EQ(Read(in, buffer), (Outcome{0, 16})) << "the halt is cleared";
        }
    }
}

}  // namespace
}  // namespace Varnholt::Tests
