// What the instrument's own driver and the USBIO driver have in common, each with its own controls and codes.
#include "Platform/Drivers/DriverFixture.h"
#include "Support/Transport.h"

namespace Varnholt::Tests {
namespace {

namespace UsbIo = Protocol::UsbIoDriver;
using namespace Platform;
using namespace Protocol;

class EitherDriver : public DriverFixture, public testing::WithParamInterface<Transport> {
  protected:
    bool IsNative() const { return GetParam() == Transport::Native; }
    ErrorCode Code(ErrorCode native, ErrorCode usbIo) const { return IsNative() ? native : usbIo; }
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
OSTRA_ON_BOTH_TRANSPORTS(EitherDriver);

TEST_P(EitherDriver, CarriesVendorRequests) {
    const auto file = OpenMain();
    for (const auto& [request, in, value, index, length, moved] : std::vector<
             std::tuple<std::uint8_t, bool, std::uint16_t, std::uint16_t, std::uint32_t, std::uint32_t>>{
             {0xC0, false, 0, 0, 0, 0},
             {0xC1, false, 0x1234, 0xABCD, 8, 8},
             {0xA0, false, 0x2000, 0, 65535, 65535},
             {0xC2, true, 0, 0, 8, 8},
             {0xD1, true, 0, 0x0102, 6, 2},
         }) {
        SCOPED_TRACE(int{request});
        device_->AnswerAtOnce(TransferStatus::Completed, moved);
        const Bytes before = Counting(length, 7);
        Bytes data = before, after = before;
        EXPECT_EQ(Vendor(file, request, in, data, value, index), (Outcome{0, moved}));
        const std::uint8_t type = in ? 0xC0 : 0x40;
        EXPECT_EQ(device_->last.setup, (Platform::Usb::SetupPacket{type, request, value, index,
                                                                   static_cast<std::uint16_t>(length)}));
        EXPECT_EQ(device_->last.endpoint, 0);
        EXPECT_EQ(device_->sent, in ? Bytes() : before);
        std::iota(after.data(), after.data() + (in ? moved : 0), std::uint8_t{0});
        EXPECT_EQ(data, after);
    }
}

TEST_P(EitherDriver, HasAFileForEachEndpoint) {
    device_->AnswerAtOnce(TransferStatus::Completed, 100);
    for (const std::uint8_t endpoint : {BulkInEndpoint, BulkOutEndpoint, InterruptInEndpoint}) {
        SCOPED_TRACE(int{endpoint});
        const bool in = endpoint != BulkOutEndpoint;
        const auto file = OpenEndpoint(endpoint);
        const auto move = [&](Bytes& bytes) { return in ? Read(file, bytes) : Write(file, bytes); };
        Bytes buffer = Counting(65536, 3), none;
        EXPECT_EQ(move(buffer), (Outcome{0, 100}));
        EXPECT_EQ(buffer[99], in ? 99 : 102);
        EXPECT_EQ(buffer[100], 103);
        EXPECT_EQ(device_->last.endpoint, endpoint);
        EXPECT_EQ(device_->last.length, 65536U);
        EXPECT_EQ(device_->sent, in ? none : buffer);
        const int before = device_->submissions;
        EXPECT_EQ(move(none), (Outcome{0, 0}));
        EXPECT_EQ(device_->submissions - before, in ? 0 : 1) << "an empty packet can be sent, not asked for";
        EXPECT_EQ((in ? Write(file, buffer) : Read(file, buffer)).code,
                  Code(Errors::InvalidFunction, UsbIo::Status::InvalidDirection));
    }
}

TEST_P(EitherDriver, AbortEndsTheTransfersOfTheEndpoint) {
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
    for (Request& each : aborted) {
        EXPECT_EQ(Result(in, each, true),
                  (Outcome{Code(Errors::OperationAborted, UsbIo::Status::Cancelled), 0}));
    }
    EXPECT_EQ(Result(interrupt, other), (Outcome{Errors::IoIncomplete, 0}));
    device_->Send(InterruptInEndpoint, {1});
    EXPECT_EQ(Result(interrupt, other, true), (Outcome{0, 1}));
}

TEST_P(EitherDriver, HasACodeForEveryOutcome) {
    const std::vector<std::tuple<TransferStatus, ErrorCode, ErrorCode>> cases{
        {TransferStatus::Completed, 0, 0},
        {TransferStatus::Stalled, 31, 0xE0000030},
        {TransferStatus::IoError, 31, 0xE0000011},
        {TransferStatus::Overflow, 31, 0xE0000012},
        {TransferStatus::Cancelled, 995, 0xE0010000},
        {TransferStatus::DeviceGone, 1167, 0xE000100A},
    };
    const auto main = OpenMain();
    const auto in = OpenEndpoint(BulkInEndpoint);
    for (const auto& [status, native, usbIo] : cases) {
        SCOPED_TRACE(static_cast<int>(status));
        Bytes buffer(16, 0x77), data{1, 2};
        device_->AnswerAtOnce(status, 5);
        EXPECT_EQ(Read(in, buffer), (Outcome{Code(native, usbIo), 5}));
        EXPECT_EQ(buffer[4], 4) << "what has moved counts, whatever the end";
        device_->AnswerAtOnce(status, 1);
        const bool isGone = status == TransferStatus::DeviceGone && !IsNative();
        EXPECT_EQ(Vendor(main, 0xC0, false, data), (Outcome{Code(native, usbIo), isGone ? 0U : 1U}));
    }
    EXPECT_EQ(device_->clearedHalts, Bytes{BulkInEndpoint}) << "no halt outlasts what comes next";
}

}  // namespace
}  // namespace Varnholt::Tests
