// The command set over a simulated instrument, by either transport: messages, and where failures say they
// passed.
#include <optional>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "Support/DriverTest.h"
#include "Support/SimulatedHost.h"
#include "Utilities/Multithreading/Mutex.h"

namespace Varnholt::Tests {
namespace {

using DeviceDriver::Generic::MessageButtonData;
using DeviceDriver::Generic::MessageDeviceGone;
using DeviceDriver::Ostra::LowLevel::PellandoFunctionality;
using Platform::SleepMilliseconds;
using testing::ElementsAre;
using Codes = std::vector<std::uint32_t>;

class OpenedInstrument : public testing::TestWithParam<Transport> {
  protected:
    TestClock clock_{TestTime::Virtual};
    SimulatedHost host_{GetParam()};
    Simulator::SimulatedInstrument& instrument_ = host_.Add("a");
    const std::string transport_ =
        GetParam() == Transport::Native ? "PellandoFunctionality_PC" : "PellandoFunctionality_Win64";
};
INSTANTIATE_TEST_SUITE_P(Transports, OpenedInstrument, testing::Values(Transport::Native, Transport::UsbIo),
                         [](const auto& parameter) { return std::string(Name(parameter.param)); });

TEST_P(OpenedInstrument, SendsItsMessagesUntilTheListenerIsRemoved) {
    const struct {
        const char* name;
        bool isRemoved, isPressed, isUnplugged;
        Codes messages;
    } cases[] = {
        {"pressed and unplugged", false, true, true, {MessageButtonData, MessageDeviceGone}},
        {"unplugged", false, false, true, {MessageDeviceGone}},
        {"removed before that", true, true, true, {}},
        {"pressed and closed", false, true, false, {MessageButtonData}},
        {"closed untouched", false, false, false, {}},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        RecordingListener listener;
        {
            PellandoFunctionality opened(&listener, 0);
            SleepMilliseconds(50);  // an interrupt just after the opening is thrown away
            if (row.isRemoved) {
                opened.removeListener(&listener);
            }
            if (row.isPressed) {
                instrument_.PressButton();
                SleepMilliseconds(50);
            }
            if (row.isUnplugged) {
                instrument_.Unplug();
                SleepMilliseconds(50);
            }
        }
        EXPECT_EQ(listener.Codes(), row.messages);
        instrument_.PlugIn();
    }
}

TEST_P(OpenedInstrument, ClosesWithoutWaitingForTheDeviceLock) {
    RecordingListener listener;
    std::optional<PellandoFunctionality> opened(std::in_place, &listener, 0);
    SleepMilliseconds(50);
    Varnholt::Utilities::Multithreading::Mutex mutex(std::string(Name(GetParam())) + "a");
    mutex.Lock();
    const Stopwatch watch(clock_);
    BackgroundThread closer([&] { opened.reset(); });
    WaitUntil([&] { return closer.HasEnded(); });
    watch.ExpectAtMost(5);
    mutex.Unlock();
    EXPECT_FALSE(instrument_.Claimed());
    EXPECT_EQ(listener.Codes(), Codes());
}

/// The operations of a trace, without namespaces and places.
template <class Operation>
Lines TraceOf(Operation operation) {
    Lines operations;
    try {
        operation();
        ADD_FAILURE() << "nothing thrown";
    } catch (const IOException& exception) {
        const std::string front = "::Varnholt::DeviceDriver::Ostra::LowLevel::";
        for (const std::string& entry : exception.GetTrace()) {
            EXPECT_THAT(entry, testing::StartsWith(front));
            operations.push_back(entry.substr(front.size(), entry.find("()") - front.size()));
        }
    }
    return operations;
}

TEST_P(OpenedInstrument, FailuresNameTheOperationsThatTheyLeft) {
    host_.Bus().SetFaults("a", Simulator::FaultPlan::Parse("control 1:stall; bulk-in 0:stall"));
    PellandoFunctionality opened(nullptr, 0);
    std::uint8_t byte = 0;
    const std::pair<const char*, std::function<void()>> cases[] = {
        {"::SetMeasureMode", [&] { opened.SetMeasureMode(1); }},
        {"::MeasureRequest", [&] { opened.MeasureRequest(&byte, 1, 1); }}};
    for (const auto& [operation, run] : cases) {
        Lines trace = TraceOf(run);
        ASSERT_GT(trace.size(), 2U);
        trace.erase(trace.begin(), trace.end() - 2);
        EXPECT_THAT(trace,
                    ElementsAre(transport_ + operation, std::string("PellandoFunctionality") + operation));
    }
}

TEST_P(OpenedInstrument, AnOpeningThatFailsNamesEachOperationOnce) {
    host_.Bus().SetFaults("a", Simulator::FaultPlan::Parse("control 0:stall"));
    const auto open = [] { PellandoFunctionality(nullptr, 0); };
    Lines trace = TraceOf(open);
    ASSERT_GT(trace.size(), 3U);
    trace.erase(trace.begin(), trace.end() - 3);
    const std::string constructor = "PellandoFunctionality::PellandoFunctionality";
    EXPECT_THAT(trace, ElementsAre(transport_ + "::Reset", "PellandoFunctionality::Reset", constructor));

    instrument_.Unplug();
    const std::string search =
        transport_ + (GetParam() == Transport::Native ? "::GetDeviceAddress" : "::InitUSBIO");
    EXPECT_THAT(TraceOf(open), ElementsAre(search, search, transport_ + "::" + transport_,
                                           "PellandoFunctionalityByte::Instance", constructor))
        << "the place of the failure, then the operations";
}

}  // namespace
}  // namespace Varnholt::Tests
