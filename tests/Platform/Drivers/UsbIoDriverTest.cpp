#include "Platform/Drivers/DriverFixture.h"
#include "Support/TestClock.h"

namespace Varnholt::Tests {
namespace {

namespace Errors = Platform::Errors;
namespace Code = Protocol::UsbIoDriver::Control;
namespace Status = Protocol::UsbIoDriver::Status;

constexpr std::uint8_t In = Protocol::BulkInEndpoint;
constexpr std::uint8_t Out = Protocol::BulkOutEndpoint;

/// A device control on one of several files, and its status.
struct Step {
    std::size_t file;
    std::uint32_t code;
    Bytes input;
    std::size_t outputSize;
    Platform::ErrorCode status;
};

class UsbIoDriver : public DriverFixture {
  protected:
    void Play(const char* name, const std::vector<Step>& steps) {
        std::vector<Platform::Handle> opened;
        for (std::size_t i = 0; i < steps.size(); ++i) {
            const Step& step = steps[i];
            while (opened.size() <= step.file) {
                opened.push_back(Open("usbio/port1"));
            }
            Bytes output(step.outputSize);
            EXPECT_EQ(Control(opened[step.file], step.code, step.input, output).code, step.status)
                << name << ", step " << i << ": code 0x" << std::hex << step.code << " on file " << step.file;
        }
        for (const auto handle : opened) {
            EXPECT_TRUE(files_->CloseFile(handle));
        }
        EXPECT_FALSE(device_->IsOpen()) << name;
    }
};

TEST_F(UsbIoDriver, ChecksStatesAsARealDriverDoes) {
    const Step configure{0, Code::SetConfiguration, ConfigurationBlock(), 0, 0};
    Play("unconfiguring what is not configured",
         {{0, Code::UnconfigureDevice, {}, 0, 0}, {0, Code::UnconfigureDevice, {}, 0, 0}});
    Play("configuring twice",
         {configure,
          {0, Code::SetConfiguration, ConfigurationBlock(), 0, Status::AlreadyConfigured},
          {1, Code::SetConfiguration, ConfigurationBlock(), 0, Status::AlreadyConfigured},
          {1, Code::UnconfigureDevice, {}, 0, 0},
          {1, Code::SetConfiguration, ConfigurationBlock(), 0, 0}});
    Play("binding", {{0, Code::BindPipe, {In}, 0, Status::NotConfigured},
                     configure,
                     {0, Code::BindPipe, {0x81}, 0, Status::PipeNotFound},
                     {0, Code::BindPipe, {0}, 0, Status::PipeNotFound},
                     {1, Code::BindPipe, {In}, 0, 0},
                     {1, Code::BindPipe, {In}, 0, Status::AlreadyBound},
                     {1, Code::BindPipe, {Out}, 0, Status::AlreadyBound},
                     {2, Code::BindPipe, {In}, 0, Status::AlreadyBound},
                     {2, Code::BindPipe, {Out}, 0, 0},
                     {3, Code::BindPipe, {Protocol::InterruptInEndpoint}, 0, 0}});
    Play("open pipes keep the configuration", {configure,
                                               {1, Code::BindPipe, {In}, 0, 0},
                                               {0, Code::UnconfigureDevice, {}, 0, Status::OpenPipes},
                                               {1, Code::UnconfigureDevice, {}, 0, Status::OpenPipes}});
    Play("aborting", {{0, Code::AbortPipe, {}, 0, Status::NotBound},
                      configure,
                      {0, Code::AbortPipe, {}, 0, Status::NotBound},
                      {0, Code::BindPipe, {In}, 0, 0},
                      {0, Code::AbortPipe, {}, 0, 0}});
    Play("a vendor request before the configuration",
         {{0, Code::ClassOrVendorOutRequest, RequestBlock(0xC0), 0, Status::NotConfigured},
          {0, Code::ClassOrVendorInRequest, RequestBlock(0xC0), 0, Status::NotConfigured}});
}

TEST_F(UsbIoDriver, ChecksSizesAndContents) {
    Bytes tooShort = ConfigurationBlock();
    tooShort.pop_back();
    Play("configuration blocks",
         {{0, Code::SetConfiguration, {}, 0, Status::InputBufferTooSmall},
          {0, Code::SetConfiguration, tooShort, 0, Status::InputBufferTooSmall},
          {0, Code::SetConfiguration, ConfigurationBlock(1), 0, Status::InvalidParameter},
          {0, Code::SetConfiguration, ConfigurationBlock(0, 0), 0, Status::InvalidParameter},
          {0, Code::SetConfiguration, ConfigurationBlock(0, 2), 0, Status::InvalidParameter},
          {0, Code::SetConfiguration, ConfigurationBlock(0, 33), 0, Status::InvalidParameter},
          {0, Code::SetConfiguration, ConfigurationBlock(0, 1, 0, 0, 0), 0, Status::InvalidParameter},
          {0, Code::SetConfiguration, ConfigurationBlock(0, 1, 1), 0, Status::InterfaceNotFound},
          {0, Code::SetConfiguration, ConfigurationBlock(0, 1, 0, 1), 0, Status::InterfaceNotFound}});
    EXPECT_EQ(device_->TimesOpened(), 0u) << "a block that is refused does not reach the device";
    Play("the other controls",
         {{0, Code::SetConfiguration, ConfigurationBlock(), 0, 0},
          {0, Code::BindPipe, {}, 0, Status::InputBufferTooSmall},
          {0, Code::GetDriverInfo, {}, 11, Status::OutputBufferTooSmall},
          {0, Code::GetDriverInfo, {}, 0, Status::OutputBufferTooSmall},
          {0, Code::GetDeviceParameters, {}, 7, Status::OutputBufferTooSmall},
          {0, Code::SetDeviceParameters, Bytes(7), 0, Status::InputBufferTooSmall},
          {0, Code::ClassOrVendorOutRequest, Bytes(17), 0, Status::InputBufferTooSmall},
          {0, Code::ClassOrVendorInRequest, Bytes(17), 0, Status::InputBufferTooSmall},
          {0, Code::ClassOrVendorOutRequest, RequestBlock(1, 0, 0, 1), 0, Status::InvalidType},
          {0, Code::ClassOrVendorOutRequest, RequestBlock(1, 0, 0, 2, 1), 0, Status::InvalidRecipient},
          {0, Code::ClassOrVendorOutRequest, RequestBlock(1, 0, 0, 2, 0, 0x80), 0, Status::InvalidParameter},
          {0, Code::ClassOrVendorOutRequest, RequestBlock(1, 0, 0, 2, 0, 0x01), 0, Status::InvalidParameter},
          {0, Code::ClassOrVendorOutRequest, RequestBlock(1), 65536, Status::InvalidParameter},
          {0, Protocol::NativeDriver::ControlVendorRequest, Bytes(18), 0, Status::ControlNotSupported},
          {0, 0, {}, 0, Status::ControlNotSupported}});
}

TEST_F(UsbIoDriver, ListingLeavesTheDeviceAlone) {
    device_->AnswerClaim(Errors::Busy);
    const auto file = Open("usbio/port1");
    Bytes info(16, 0x55);
    EXPECT_EQ(Control(file, Code::GetDriverInfo, {}, info), (Outcome{0, 12}));
    EXPECT_EQ(info, (Bytes{0x30, 0x02, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0x55, 0x55, 0x55, 0x55}));
    EXPECT_TRUE(files_->CloseFile(file));
    EXPECT_EQ(device_->TimesOpened(), 0u);
}

TEST_F(UsbIoDriver, ConfiguringTellsWhyTheDeviceCannotBeHad) {
    const struct {
        Platform::ErrorCode code;
        Platform::ErrorCode status;
    } cases[] = {
        {Errors::Busy, Status::OpenedByOtherProcess},        {Errors::AccessDenied, Errors::AccessDenied},
        {Errors::NotEnoughMemory, Status::NoMemory},         {Errors::GeneralFailure, Status::RequestFailed},
        {Errors::DeviceNotConnected, Status::DeviceRemoved}, {Errors::SemaphoreTimeout, Status::TimedOut},
    };
    for (const auto& row : cases) {
        const auto file = Open("usbio/port1");
        bus_.AnswerOpen(row.code);
        EXPECT_EQ(Control(file, Code::SetConfiguration, ConfigurationBlock()).code, row.status) << row.code;
        EXPECT_TRUE(files_->CloseFile(file));
        bus_.AnswerOpen(Errors::Success);

        const auto silent = Open("usbio/port1");
        EXPECT_EQ(Control(silent, Code::SetConfiguration, ConfigurationBlock()).code, Status::Success);
        device_->AnswerEndpoints(row.code);
        EXPECT_EQ(Control(silent, Code::BindPipe, {In}).code, row.status) << row.code;
        device_->AnswerEndpoints(Errors::Success);
        EXPECT_TRUE(files_->CloseFile(silent));

        const auto second = Open("usbio/port1");
        device_->AnswerClaim(row.code);
        EXPECT_EQ(Control(second, Code::SetConfiguration, ConfigurationBlock()).code, row.status) << row.code;
        device_->AnswerClaim(Errors::Success);
        EXPECT_EQ(Control(second, Code::UnconfigureDevice).code,
                  row.status == Status::DeviceRemoved ? Status::DeviceRemoved : Status::Success);
        EXPECT_TRUE(files_->CloseFile(second));
    }
}

TEST_F(UsbIoDriver, TheConfigurationLastsAsLongAsAFileIsOpen) {
    const auto first = Open("usbio/port1");
    const auto second = Open("usbio/port1");
    EXPECT_EQ(Control(first, Code::SetConfiguration, ConfigurationBlock()).code, 0u);
    EXPECT_EQ(Control(first, Code::BindPipe, {In}).code, 0u);
    EXPECT_TRUE(files_->CloseFile(first));
    EXPECT_TRUE(device_->IsClaimed());
    EXPECT_EQ(Control(second, Code::BindPipe, {In}).code, 0u) << "closing unbinds";
    EXPECT_TRUE(files_->CloseFile(second));
    EXPECT_FALSE(device_->IsClaimed());

    const auto third = Open("usbio/port1");
    EXPECT_EQ(Control(third, Code::BindPipe, {In}).code, Status::NotConfigured);
    EXPECT_EQ(Control(third, Code::SetConfiguration, ConfigurationBlock()).code, 0u);
    EXPECT_EQ(Control(third, Code::UnconfigureDevice).code, 0u);
    EXPECT_FALSE(device_->IsClaimed());
}

TEST_F(UsbIoDriver, ParametersBelongToTheDevice) {
    const auto first = Open("usbio/port1");
    const auto second = Open("usbio/port1");
    Bytes parameters(8, 0x55);
    EXPECT_EQ(Control(first, Code::GetDeviceParameters, {}, parameters), (Outcome{0, 8}));
    EXPECT_EQ(parameters, Bytes(8));
    EXPECT_EQ(Control(first, Code::SetDeviceParameters, Counting(8, 1)).code, 0u);
    EXPECT_EQ(Control(second, Code::GetDeviceParameters, {}, parameters), (Outcome{0, 8}));
    EXPECT_EQ(parameters, Counting(8, 1));
}

TEST_F(UsbIoDriver, TransfersNeedABoundPipe) {
    Bytes buffer(1);
    const auto unbound = Open("usbio/port1");
    EXPECT_EQ(Read(unbound, buffer).code, Status::NotBound);
    EXPECT_EQ(Write(unbound, buffer).code, Status::NotBound);
    OpenBound(In);
    EXPECT_EQ(Read(unbound, buffer).code, Status::NotBound);
}

TEST_F(UsbIoDriver, PassesOnReservedBitsOfTheRequestType) {
    device_->Expect({ControlOut({Protocol::VendorOut | 0x1C, 0xC7, 0, 0, 1}, {5})});
    Bytes data{5};
    EXPECT_EQ(
        Control(OpenBound(In), Code::ClassOrVendorOutRequest, RequestBlock(0xC7, 0, 0, 2, 0, 0x1C), data),
        (Outcome{0, 1}));
}

TEST_F(UsbIoDriver, TheConfigurationLimitsTransfers) {
    device_->Expect({BulkIn(512, {})});
    const auto file = Open("usbio/port1");
    EXPECT_EQ(Control(file, Code::SetConfiguration, ConfigurationBlock(0, 1, 0, 0, 512)).code, 0u);
    EXPECT_EQ(Control(file, Code::BindPipe, {In}).code, 0u);
    Bytes fits(512), tooLong(513);
    EXPECT_EQ(Read(file, fits).code, 0u);
    EXPECT_EQ(Read(file, tooLong).code, Status::InvalidParameter);
}

TEST_F(UsbIoDriver, GivesUpWhatNobodyElseLimits) {
    const TestClock clock(TestTime::Virtual);
    if (!clock.IsVirtual()) {
        GTEST_SKIP() << "takes eleven seconds of real time";
    }
    device_->Expect({VendorOut(0xC0, {}).OnDemand(), VendorIn(0xC2, 8, Counting(8)).After(4'999'000),
                     BulkOut(Counting(100)).OnDemand().MovesWhenCancelled(64), BulkOut({1}).After(5'000'000),
                     BulkIn(8, {}).OnDemand()});
    const auto out = OpenBound(Out);
    const auto in = OpenBound(In);
    Bytes buffer(8);
    const Stopwatch control(clock);
    EXPECT_EQ(Control(out, Code::ClassOrVendorOutRequest, RequestBlock(0xC0)),
              (Outcome{Status::TimedOut, 0}));
    control.Expect(5000);
    EXPECT_EQ(Control(out, Code::ClassOrVendorInRequest, RequestBlock(0xC2), buffer), (Outcome{0, 8}));
    const Stopwatch write(clock);
    EXPECT_EQ(Write(out, Counting(100)), (Outcome{Status::TimedOut, 64}));
    write.Expect(6000);
    EXPECT_EQ(Write(out, {1}), (Outcome{0, 1}));

    Request reading;
    StartPending(in, buffer, reading);
    EXPECT_EQ(Platform::Wait(reading.event.Get(), 100'000), Platform::WaitResult::TimedOut)
        << "who reads has a limit of his own";
    EXPECT_TRUE(files_->CloseFile(in));
}

TEST_F(UsbIoDriver, ADeviceThatIsGoneHasOneCode) {
    device_->LeaveToTest(In);
    const auto main = Open("usbio/port1");
    const auto in = OpenBound(In);
    Bytes buffer(8), info(12), parameters(8);
    Request reading;
    StartPending(in, buffer, reading);
    bus_.Unplug("port1");
    EXPECT_EQ(Result(in, reading, true), (Outcome{Status::DeviceRemoved, 0}));
    EXPECT_EQ(Read(in, buffer).code, Status::DeviceRemoved);
    EXPECT_EQ(Control(main, Code::ClassOrVendorOutRequest, RequestBlock(0xC0)).code, Status::DeviceRemoved);
    EXPECT_EQ(Control(main, Code::UnconfigureDevice).code, Status::DeviceRemoved);
    EXPECT_EQ(Control(main, Code::SetConfiguration, ConfigurationBlock()).code, Status::DeviceRemoved);
    EXPECT_EQ(Control(main, Code::BindPipe, {Out}).code, Status::DeviceRemoved);
    EXPECT_EQ(Control(in, Code::AbortPipe).code, Status::DeviceRemoved);
    EXPECT_EQ(Control(main, Code::GetDeviceParameters, {}, parameters).code, Status::DeviceRemoved);
    EXPECT_EQ(Control(main, Code::GetDriverInfo, {}, info).code, 0u);
    EXPECT_EQ(OpenError("usbio/port1"), Errors::FileNotFound);
    EXPECT_TRUE(files_->CloseFile(in));
    EXPECT_TRUE(files_->CloseFile(main));
}

}  // namespace
}  // namespace Varnholt::Tests
