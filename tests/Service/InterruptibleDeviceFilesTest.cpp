#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "Service/InterruptibleDeviceFiles.h"
#include "Service/Interruption.h"
#include "Support/DriverTest.h"

namespace Varnholt::Tests {
namespace {

using Interruptions = TransportTest;
OSTRA_ON_BOTH_TRANSPORTS(Interruptions);

TEST_P(Interruptions, RefuseAtOnceWhatBeginsBehindThem) {
    Service::InterruptibleDeviceFiles files(driver_);
    const Platform::ScopedDeviceFiles inForce(files);
    DeviceDriver::Ostra::LowLevel::PellandoFunctionality instrument(nullptr, 0);
    const auto setMode = [&] { instrument.SetMeasureMode(1); };
    for (const std::string& device : {std::string(), Paths(1)[0]}) {
        driver_.TakeTranscript();
        files.Interrupt(device);
        const Stopwatch watch(clock_);
        try {
            setMode();
            ADD_FAILURE() << "passed for carried out";
        } catch (const IOException& refused) {
            EXPECT_EQ(refused.Code(), Platform::Errors::OperationAborted);
        }
        watch.ExpectAtMost(2);
        EXPECT_THAT(WithoutListener(driver_.TakeTransfers()), IsEmpty());
        files.Resume(device);
        EXPECT_NO_THROW(setMode());
    }
    files.Interrupt(Paths(2)[1]);
    EXPECT_NO_THROW(setMode()) << "of another device";
}

TEST_P(Interruptions, AreForgottenOnceTheyAreWithdrawn) {
    Service::Interruption interruption;
    interruption.Request();
    interruption.Withdraw();
    const Stopwatch watch(clock_);
    EXPECT_TRUE(interruption.Sleep(20));
    watch.Expect(20);
}

TEST_P(Interruptions, AbortThePipesOnWhichTransfersRun) {
    using Platform::Operation;
    std::string told;
    Service::InterruptibleDeviceFiles files(driver_, [&](const std::string& line) {
        told += line;
        Platform::SetLastError(Platform::Errors::Success);
    });
    const auto open = [&](std::size_t device, const std::string& pipe) {
        return files.Open(Paths(2)[device] + (IsNative() ? "\\PIPE0" + pipe : ""));
    };
    driver_.CloseFile(files.Open(Paths(2)[0]));  // nothing is sent to the other device
    files.Open(Paths(2)[1]);
    const auto idle = open(1, "1"), busy = open(1, "2");
    const Platform::OwnedHandle event(Platform::MakeAutoResetEvent());
    Platform::Overlapped record{.event = event.Get()};
    Bytes data(4);
    driver_.Script(IsNative() ? 2 : 0, {.refusal = Platform::Errors::Busy});
    EXPECT_FALSE(files.Start(busy, Operation::Write(data.data(), 4), record));
    EXPECT_EQ(std::exchange(told, ""), "bulk out 0 of 4: failed with code 0xAA");
    driver_.Script(IsNative() ? 2 : 0, {.after = Never});
    files.Start(busy, Operation::Write(data.data(), 4), record);
    files.CloseFile(idle);
    driver_.TakeTranscript();
    driver_.Script(0, {.after = Never, .cancelledAfter = 5});
    const Stopwatch watch(clock_);
    files.Interrupt(Paths(2)[1]);
    watch.Expect(2005);  // for the driver's answer, and the end of its asking
    EXPECT_THAT(
        driver_.TakeTranscript(),
        ElementsAre(IsNative() ? "control 220009 00 00 00 00 00 00 03 00 00 00 /" : "control 80942084 /",
                    "cancel 0"));
    files.CancelTransfers(busy);
    std::uint32_t moved = 0;
    EXPECT_FALSE(files.GetResult(busy, record, moved, false));
    EXPECT_EQ(Platform::LastError(), Platform::Errors::OperationAborted);
    EXPECT_EQ(told, "bulk out 0 of 4: cancelled");
    driver_.TakeTranscript();
    files.Interrupt(Paths(2)[1]);
    EXPECT_THAT(driver_.TakeTranscript(), IsEmpty()) << "nothing runs any more";
}

}  // namespace
}  // namespace Varnholt::Tests
