#include "Platform/Drivers/DriverFixture.h"
#include "Support/TestClock.h"

namespace Varnholt::Tests {
namespace {

namespace Code = Protocol::UsbIoDriver::Control;
namespace Status = Protocol::UsbIoDriver::Status;

constexpr std::uint8_t Out = Protocol::BulkOutEndpoint;

/// A device control on one of several files, and its status.
struct Step {
    std::size_t file;
    std::uint32_t code;
    Bytes input;
    Platform::ErrorCode status = Status::Success;
    std::size_t outputSize = 0;
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
            EXPECT_EQ(Control(opened[step.file], step.code, step.input, output), (Outcome{step.status, 0}))
                << name << ", step " << i << ": code 0x" << std::hex << step.code << " on file " << step.file;
        }
        for (const auto handle : opened) {
            EXPECT_TRUE(files_->CloseFile(handle));
        }
        EXPECT_EQ(std::pair(device_->handles, device_->isClaimed), std::pair(0, false)) << name;
    }
};

TEST_F(UsbIoDriver, ChecksStatesAsARealDriverDoes) {
    const Step configure{0, Code::SetConfiguration, ConfigurationBlock()};
    const Step unconfigure{0, Code::UnconfigureDevice, {}};
    Play("unconfiguring what is not configured", {unconfigure, unconfigure});
    Play("configuring twice", {configure,
                               {0, Code::SetConfiguration, ConfigurationBlock(), Status::AlreadyConfigured},
                               {1, Code::SetConfiguration, ConfigurationBlock(), Status::AlreadyConfigured},
                               {1, Code::UnconfigureDevice, {}},
                               {1, Code::SetConfiguration, ConfigurationBlock()}});
    Play("binding", {{0, Code::BindPipe, {In}, Status::NotConfigured},
                     configure,
                     {0, Code::BindPipe, {0x81}, Status::PipeNotFound},
                     {0, Code::BindPipe, {0}, Status::PipeNotFound},
                     {1, Code::BindPipe, {In}},
                     {1, Code::BindPipe, {In}, Status::AlreadyBound},
                     {1, Code::BindPipe, {Out}, Status::AlreadyBound},
                     {2, Code::BindPipe, {In}, Status::AlreadyBound},
                     {2, Code::BindPipe, {Out}},
                     {3, Code::BindPipe, {Protocol::InterruptInEndpoint}}});
    Play("open pipes keep the configuration", {configure,
                                               {1, Code::BindPipe, {In}},
                                               {0, Code::UnconfigureDevice, {}, Status::OpenPipes},
                                               {1, Code::UnconfigureDevice, {}, Status::OpenPipes}});
    Play("aborting", {{0, Code::AbortPipe, {}, Status::NotBound},
                      configure,
                      {0, Code::AbortPipe, {}, Status::NotBound},
                      {0, Code::BindPipe, {In}},
                      {0, Code::AbortPipe, {}}});
    Play("a vendor request before the configuration",
         {{0, Code::ClassOrVendorOutRequest, RequestBlock(0xC0), Status::NotConfigured},
          {0, Code::ClassOrVendorInRequest, RequestBlock(0xC0), Status::NotConfigured}});
}

TEST_F(UsbIoDriver, ChecksSizesAndContents) {
    const auto refused = [](const Bytes& block, Platform::ErrorCode status) {
        return Step{0, Code::SetConfiguration, block, status};
    };
    Play("configuration blocks", {refused(Bytes(259), Status::InputBufferTooSmall),
                                  refused(ConfigurationBlock(1), Status::InvalidParameter),
                                  refused(ConfigurationBlock(0, 0), Status::InvalidParameter),
                                  refused(ConfigurationBlock(0, 2), Status::InvalidParameter),
                                  refused(ConfigurationBlock(0, 1, 0, 0, 0), Status::InvalidParameter),
                                  refused(ConfigurationBlock(0, 1, 1), Status::InterfaceNotFound),
                                  refused(ConfigurationBlock(0, 1, 0, 1), Status::InterfaceNotFound)});
    EXPECT_EQ(device_->opened, 0) << "a block that is refused does not reach the device";
    const auto vendor = [](const Bytes& block, Platform::ErrorCode status, std::size_t data = 0) {
        return Step{0, Code::ClassOrVendorOutRequest, block, status, data};
    };
    Play("the other controls",
         {{0, Code::SetConfiguration, ConfigurationBlock()},
          {0, Code::BindPipe, {}, Status::InputBufferTooSmall},
          {0, Code::GetDriverInfo, {}, Status::OutputBufferTooSmall, 11},
          {0, Code::GetDeviceParameters, {}, Status::OutputBufferTooSmall, 7},
          {0, Code::SetDeviceParameters, Bytes(7), Status::InputBufferTooSmall},
          {0, Code::ClassOrVendorInRequest, Bytes(17), Status::InputBufferTooSmall},
          vendor(Bytes(17), Status::InputBufferTooSmall),
          vendor(RequestBlock(1, 0, 0, 1), Status::InvalidType),
          vendor(RequestBlock(1, 0, 0, 2, 1), Status::InvalidRecipient),
          vendor(RequestBlock(1, 0, 0, 2, 0, 0x80), Status::InvalidParameter),
          vendor(RequestBlock(1, 0, 0, 2, 0, 0x01), Status::InvalidParameter),
          vendor(RequestBlock(1), Status::InvalidParameter, 65536),
          {0, Protocol::NativeDriver::ControlVendorRequest, Bytes(18), Status::ControlNotSupported}});
}

TEST_F(UsbIoDriver, ConfiguringTellsWhyTheDeviceCannotBeHad) {
    const std::pair<Platform::ErrorCode, Platform::ErrorCode> cases[] = {
        {Errors::Busy, Status::OpenedByOtherProcess},        {Errors::AccessDenied, Errors::AccessDenied},
        {Errors::NotEnoughMemory, Status::NoMemory},         {Errors::GeneralFailure, Status::RequestFailed},
        {Errors::DeviceNotConnected, Status::DeviceRemoved}, {Errors::SemaphoreTimeout, Status::TimedOut},
    };
    for (const auto& [code, status] : cases) {
        for (Platform::ErrorCode* const answer :
             {&bus_.openAnswer, &device_->claimAnswer, &device_->endpointsAnswer}) {
            const bool isClaimed = answer == &device_->endpointsAnswer;
            const auto file = Open("usbio/port1");
            *answer = code;
            EXPECT_EQ(Control(file, Code::SetConfiguration, ConfigurationBlock()).code,
                      isClaimed ? Status::Success : status)
                << code;
            EXPECT_EQ(Control(file, Code::BindPipe, {In}).code,
                      isClaimed || code == Errors::DeviceNotConnected ? status : Status::NotConfigured)
                << code;
            *answer = Errors::Success;
            EXPECT_TRUE(files_->CloseFile(file));
        }
    }
}

TEST_F(UsbIoDriver, TheConfigurationLastsAsLongAsAFileIsOpen) {
    const auto first = OpenBound(In);
    const auto second = Open("usbio/port1");
    Bytes parameters(8, 0x55);
    EXPECT_EQ(Control(first, Code::GetDeviceParameters, {}, parameters), (Outcome{0, 8}));
    EXPECT_EQ(parameters, Bytes(8));
    EXPECT_EQ(Control(first, Code::SetDeviceParameters, Counting(8, 1)), (Outcome{0, 0}));
    EXPECT_TRUE(files_->CloseFile(first));
    EXPECT_TRUE(device_->isClaimed);
    EXPECT_EQ(Control(second, Code::BindPipe, {In}).code, 0u) << "closing unbinds";
    EXPECT_EQ(Control(second, Code::GetDeviceParameters, {}, parameters), (Outcome{0, 8}));
    EXPECT_EQ(parameters, Counting(8, 1)) << "they are the device's";
    device_->AnswerAtOnce(TransferStatus::Stalled, 0);
    EXPECT_EQ(Read(second, parameters).code, Status::EndpointHalted);
    EXPECT_TRUE(files_->CloseFile(second));
    EXPECT_FALSE(device_->isClaimed);
    EXPECT_EQ(device_->clearedHalts, Bytes{In});

    // Listing leaves the device alone.
    const auto third = Open("usbio/port1");
    Bytes info(16, 0x55);
    EXPECT_EQ(Control(third, Code::GetDriverInfo, {}, info), (Outcome{0, 12}));
    EXPECT_EQ(info, (Bytes{0x30, 0x02, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0x55, 0x55, 0x55, 0x55}));
    EXPECT_EQ(Control(third, Code::BindPipe, {In}).code, Status::NotConfigured);
    EXPECT_EQ(device_->opened, 1);
    EXPECT_EQ(Control(third, Code::SetConfiguration, ConfigurationBlock()).code, 0u);
    EXPECT_EQ(Control(third, Code::UnconfigureDevice).code, 0u);
    EXPECT_FALSE(device_->isClaimed);
}

TEST_F(UsbIoDriver, TransfersNeedABoundPipeAndTheConfigurationLimitsThem) {
    device_->AnswerAtOnce();
    Bytes fits(512), tooLong(513), data{5};
    const auto unbound = Open("usbio/port1");
    const auto bound = Open("usbio/port1");
    EXPECT_EQ(Control(bound, Code::SetConfiguration, ConfigurationBlock(0, 1, 0, 0, 512)).code, 0u);
    EXPECT_EQ(Control(bound, Code::BindPipe, {In}).code, 0u);
    EXPECT_EQ(Read(unbound, fits).code, Status::NotBound);
    EXPECT_EQ(Write(unbound, fits).code, Status::NotBound);
    EXPECT_EQ(Read(bound, fits).code, 0u);
    EXPECT_EQ(Read(bound, tooLong).code, Status::InvalidParameter);
    EXPECT_EQ(Control(bound, Code::ClassOrVendorOutRequest, RequestBlock(0xC7, 0, 0, 2, 0, 0x1C), data).code,
              0u);
    EXPECT_EQ(device_->last.setup.requestType, 0x40 | 0x1C) << "reserved bits are passed on";
}

TEST_F(UsbIoDriver, GivesUpWhatNobodyElseLimits) {
    const TestClock clock(TestTime::Virtual);
    if (!clock.IsVirtual()) {
        GTEST_SKIP() << "takes eleven seconds of real time";
    }
    const auto out = OpenBound(Out);
    const auto in = OpenBound(In);
    device_->onCancel = [](Transfer& transfer) {
        HookedDevice::Complete(transfer, TransferStatus::Cancelled, transfer.length / 2);
    };
    const auto vendor = [&] { return Control(out, Code::ClassOrVendorInRequest, RequestBlock(0xC0)); };
    const Stopwatch control(clock);
    EXPECT_EQ(vendor(), (Outcome{Status::TimedOut, 0}));
    control.Expect(5000);
    const Stopwatch write(clock);
    Bytes buffer(100);
    Request writing, reading;
    files_->Start(out, Platform::Operation::Write(buffer.data(), 100), writing.record);
    EXPECT_EQ(Platform::Wait(writing.event.Get(), 100'000), Platform::WaitResult::Signalled);
    EXPECT_EQ(Result(out, writing), (Outcome{Status::TimedOut, 50}));
    write.Expect(6000);
    StartPending(in, buffer, reading);
    EXPECT_EQ(Platform::Wait(reading.event.Get(), 100'000), Platform::WaitResult::TimedOut)
        << "who reads has a limit of his own";
    EXPECT_TRUE(files_->CloseFile(in));

    device_->onSubmit = [](Transfer& transfer) {
        auto& scheduler = Platform::ClockScheduler();
        scheduler.CallAt(scheduler.Now() + 4'999'000, [&transfer] {
            HookedDevice::Complete(transfer, TransferStatus::Completed, transfer.length);
        });
        return Errors::Success;
    };
    EXPECT_EQ(vendor(), (Outcome{0, 0}));
    EXPECT_EQ(Write(out, {1}), (Outcome{0, 1}));
    Platform::SleepMilliseconds(10'000);  // beyond the limit of a request that is no more
}

}  // namespace
}  // namespace Varnholt::Tests
