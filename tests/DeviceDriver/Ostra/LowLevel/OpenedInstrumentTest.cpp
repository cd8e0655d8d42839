// The command set over a simulated instrument, by either transport: messages, and where failures say they
// passed.
#include <algorithm>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "Support/DriverTest.h"
#include "Support/SimulatedHost.h"

namespace Varnholt::Tests {
namespace {

using DeviceDriver::Ostra::LowLevel::PellandoFunctionality;

class OpenedInstrument : public testing::TestWithParam<Transport> {
  protected:
    TestClock clock_{TestTime::Virtual};
    SimulatedHost host_{GetParam()};
    Simulator::SimulatedInstrument& instrument_ = host_.Add("a");
};
INSTANTIATE_TEST_SUITE_P(Transports, OpenedInstrument, testing::Values(Transport::Native, Transport::UsbIo),
                         [](const auto& parameter) { return std::string(Name(parameter.param)); });

/// The operations of a trace behind the place of the failure, without namespaces: the last `count` of them.
template <class Operation>
std::string TraceOf(std::size_t count, Operation operation) {
    std::string operations;
    try {
        operation();
        ADD_FAILURE() << "nothing thrown";
    } catch (const IOException& exception) {
        const std::string front = "::Varnholt::DeviceDriver::Ostra::LowLevel::";
        const Lines trace(exception.GetTrace().begin(), exception.GetTrace().end());
        EXPECT_GT(trace.size(), count);
        for (std::size_t i = trace.size() - std::min(count, trace.size()); i < trace.size(); ++i) {
            EXPECT_THAT(trace[i], testing::StartsWith(front));
            operations += (operations.empty() ? "" : " ") +
                          trace[i].substr(front.size(), trace[i].find("()") - front.size());
        }
    }
    return operations;
}

TEST_P(OpenedInstrument, FailuresNameTheOperationsThatTheyLeft) {
    const bool isNative = GetParam() == Transport::Native;
    const std::string transport = isNative ? "PellandoFunctionality_PC" : "PellandoFunctionality_Win64";
    const std::string constructor = "PellandoFunctionality::PellandoFunctionality";
    const auto open = [] { PellandoFunctionality(nullptr, 0); };
    host_.Bus().SetFaults("a", Simulator::FaultPlan::Parse("control 0:stall"));
    EXPECT_EQ(TraceOf(3, open), transport + "::Reset PellandoFunctionality::Reset " + constructor);
    host_.Bus().SetFaults("a", Simulator::FaultPlan::Parse("control 1:stall; bulk-in 0:stall"));
    {
        PellandoFunctionality opened(nullptr, 0);
        std::uint8_t byte = 0;
        EXPECT_EQ(TraceOf(2, [&] { opened.SetMeasureMode(1); }),
                  transport + "::SetMeasureMode PellandoFunctionality::SetMeasureMode");
        EXPECT_EQ(TraceOf(2, [&] { opened.MeasureRequest(&byte, 1, 1); }),
                  transport + "::MeasureRequest PellandoFunctionality::MeasureRequest");
    }
    instrument_.Unplug();
    EXPECT_EQ(TraceOf(4, open), transport + (isNative ? "::GetDeviceAddress " : "::InitUSBIO ") + transport +
                                    "::" + transport + " PellandoFunctionalityByte::Instance " + constructor);
}

TEST_P(OpenedInstrument, SendsItsMessagesUntilTheListenerIsRemoved) {
    for (const bool isRemoved : {false, true}) {
        RecordingListener listener;
        {
            PellandoFunctionality opened(&listener, 0);
            Platform::SleepMilliseconds(50);  // an interrupt just after the opening is thrown away
            if (isRemoved) {
                opened.removeListener(&listener);
            }
            instrument_.PressButton();
            Platform::SleepMilliseconds(50);
            instrument_.Unplug();
            Platform::SleepMilliseconds(50);
        }
        EXPECT_EQ(listener.Codes(), isRemoved ? std::vector<std::uint32_t>()
                                              : std::vector({DeviceDriver::Generic::MessageButtonData,
                                                             DeviceDriver::Generic::MessageDeviceGone}));
        instrument_.PlugIn();
    }
    RecordingListener untouched;
    PellandoFunctionality(&untouched, 0);
    EXPECT_TRUE(untouched.Codes().empty());
}

}  // namespace
}  // namespace Varnholt::Tests
