#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "Service/InterruptibleDeviceFiles.h"
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

}  // namespace
}  // namespace Varnholt::Tests
