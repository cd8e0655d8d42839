#include "Platform/CallFilter.h"
#include "Protocol/Instrument.h"
#include "Support/DriverTest.h"
#include "UsbIo/CUsbIoPipe.h"

namespace Varnholt::UsbIo {
namespace {

using namespace Protocol::UsbIoDriver;
using namespace Protocol;
using testing::ElementsAre;
using Tests::Answer;
using Tests::Bytes;
using Tests::Never;
using Tests::ScriptedDriver;

constexpr std::uint32_t Pending = Platform::Errors::IoPending;

class CUsbIoPipeTest : public Tests::DriverTest {
  protected:
    void SetUp() override {
        const Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
        ASSERT_EQ(pipe_.Bind(0, BulkInEndpoint, list, &InterfaceClass), Status::Success);
        driver_.TakeTranscript();
    }
    /// Starts a read that fills the buffer.
    void StartRead(CUsbIoBuffer& buffer) {
        buffer.NumberOfBytesToTransfer = buffer.Size;
        ASSERT_TRUE(pipe_.Read(buffer));
    }

    CUsbIoPipe pipe_;
};

TEST_F(CUsbIoPipeTest, BindOpensOnlyAClosedPipe) {
    EXPECT_EQ(pipe_.Bind(0, BulkOutEndpoint, nullptr, nullptr), Status::Success);
    EXPECT_EQ(pipe_.AbortPipe(), Status::Success);
    EXPECT_THAT(driver_.TakeTranscript(), ElementsAre("control 80942078 03 /", "control 80942084 /"));
    CUsbIoPipe other;
    driver_.RefuseOpen("\\\\.\\USBIO_Device7", Platform::Errors::AccessDenied);
    EXPECT_EQ(other.Bind(7, BulkInEndpoint, nullptr, nullptr), Platform::Errors::AccessDenied);
    EXPECT_FALSE(other.IsOpen());
}

TEST_F(CUsbIoPipeTest, ReadSyncReportsStatusAndBytesMoved) {
    constexpr std::uint32_t Bad = Status::EndpointHalted;
    const Bytes data{1, 2, 3, 4};
    const auto cancelled = [&](std::uint32_t after, std::uint32_t code) {
        return Answer{.data = data,
                      .after = Never,
                      .cancelledAfter = after,
                      .cancelledWith = code,
                      .cancelledWithData = true};
    };
    const struct {
        const char* name;
        Answer answer;
        std::uint32_t status;
        std::uint32_t moved;
        std::uint32_t milliseconds;
    } cases[] = {
        {"later", {.data = data, .after = 50}, 0, 4, 50},
        {"short", {.data = {1}, .after = 5}, 0, 1, 5},
        {"empty", {.after = 5}, 0, 0, 5},
        {"fails at once", {.code = Bad}, Bad, 0, 0},
        {"fails later with data", {.data = {1, 2}, .code = Bad, .after = 5}, Bad, 2, 5},
        {"silent", {.after = Never}, Status::TimedOut, 0, 100},
        {"cancelled with data", cancelled(0, 995), Status::TimedOut, 4, 100},
        {"cancelled slowly: the buffer is not free before", cancelled(60, 995), Status::TimedOut, 4, 160},
        {"more than there is room for", {.data = data, .count = 99}, 0, 4, 0},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        driver_.Script(BulkInEndpoint, row.answer);
        Bytes buffer(4, 0xEE), expected(4, 0xEE);
        std::uint32_t size = 4;
        const Tests::Stopwatch stopwatch(clock_);
        EXPECT_EQ(pipe_.ReadSync(buffer.data(), size, 100), row.status);
        stopwatch.ExpectBetween(row.milliseconds, row.milliseconds + 1);
        EXPECT_EQ(size, row.moved);
        std::copy_n(data.begin(), row.moved, expected.begin());
        EXPECT_EQ(buffer, expected);
        EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
    }
    std::uint8_t byte = 0;
    std::uint32_t size = 1;
    EXPECT_EQ(pipe_.ReadSync(&byte, size, 0), Status::TimedOut);
}

TEST_F(CUsbIoPipeTest, AnEventEndsTheWaitButNotTheTransfer) {
    const Platform::OwnedHandle event(Platform::MakeAutoResetEvent());
    driver_.Script(BulkInEndpoint, {.data = {5}, .after = 80});
    CUsbIoBuffer buffer(8);
    StartRead(buffer);
    EXPECT_EQ(buffer.Status, Pending);
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, 0), Status::TimedOut);
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, 20, event.Get()), Status::TimedOut);
    Platform::SignalEvent(event.Get());
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, Platform::Infinite, event.Get()), Status::UserEvent);
    EXPECT_EQ(buffer.Status, Pending);
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, Platform::Infinite, event.Get()), Status::Success);
    EXPECT_EQ(buffer.BytesTransferred, 1U);
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, Platform::Infinite), Status::Success);
}

TEST_F(CUsbIoPipeTest, ABufferThatIsStartedAgainEndsItsTransferFirst) {
    CUsbIoBuffer buffer(8);
    driver_.Script(BulkInEndpoint, {.after = Never});
    driver_.Script(BulkInEndpoint, {.data = {7, 8}});
    StartRead(buffer);
    StartRead(buffer);
    EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
    EXPECT_EQ(buffer.BytesTransferred, 2U);
    StartRead(buffer);
    pipe_.CancelToCompletion(buffer);
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, 0), Platform::Errors::OperationAborted);
}

TEST_F(CUsbIoPipeTest, RefusesTransfersThatCannotBeRight) {
    CUsbIoBuffer buffer(8);
    buffer.NumberOfBytesToTransfer = 9;
    EXPECT_FALSE(pipe_.Read(buffer));
    EXPECT_EQ(buffer.Status, Platform::Errors::InvalidParameter);
    buffer.NumberOfBytesToTransfer = 8;
    pipe_.Close();
    EXPECT_FALSE(pipe_.Write(buffer));
    EXPECT_EQ(buffer.Status, Platform::Errors::InvalidHandle);

    Platform::InstallCallFilter([](std::string_view) { return Platform::Errors::NoSystemResources; });
    CUsbIoBuffer withoutEvent(8);
    Platform::InstallCallFilter({});
    withoutEvent.NumberOfBytesToTransfer = 8;
    EXPECT_FALSE(pipe_.Read(withoutEvent));
    EXPECT_EQ(withoutEvent.Status, Platform::Errors::NoSystemResources);
}

}  // namespace
}  // namespace Varnholt::UsbIo
