// The exported functions with the first, second, third... allocation failing, until a call gets by without a
// failure.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstdio>
#include <vector>

#include "ostra.h"
#include "Support/ResourceCount.h"
#include "Support/SimulatedHost.h"
#include "Sweeps/ExemptDevice.h"
#include "Sweeps/FailingAllocator.h"
#include "Utilities/Multithreading/Condition.h"
#include "VirtualClock.h"

namespace Varnholt::Tests {
namespace {

using TestSupport::ResourceCount;

using Call = std::int32_t (*)();

std::int32_t Readout() {
    static std::array<std::int32_t, OSTRA_READOUT_VALUES> values;
    return d4fb86cecc88582a(values.data(), "");
}

std::int32_t ImageWrite() {
    static const std::array<std::uint8_t, OSTRA_IMAGE_SIZE> image{};
    return f3355d91d5df0e0b(image.data(), "");
}

std::int32_t NamedReadout() {
    static std::array<std::int32_t, OSTRA_READOUT_VALUES> values;
    return d4fb86cecc88582a(values.data(), "an instrument that is not connected, with a name of some length");
}

struct Case {
    const char* name;
    Call call;
    bool succeeds;  ///< when no allocation fails
};
constexpr std::array Cases{Case{"Readout", &Readout, true}, Case{"ImageWrite", &ImageWrite, true},
                           Case{"NamedReadout", &NamedReadout, false}};

class AllocationFailure : public testing::TestWithParam<std::tuple<Transport, std::size_t>> {};

TEST_P(AllocationFailure, EndsInAResultCodeAndLeavesNothing) {
    const auto [transport, index] = GetParam();
    const Case& tested = Cases[index];
    Simulator::VirtualClock clock(1);
    SimulatedHost host(transport);
    auto& instrument = host.Add("one");
    host.Bus().WrapDevices(
        [](const std::string&, auto device) { return std::make_shared<ExemptDevice>(device); });
    StartTheClocksOwnThread();
    ASSERT_EQ(tested.call() == OSTRA_OK, tested.succeeds) << b5ae189db26b2a1b("LastError");
    const ResourceCount before = ResourceCount::TakeSettled();

    long failures = 0;
    for (bool reached = true; reached; ++failures) {
        SCOPED_TRACE("allocation " + std::to_string(failures + 1));
        const std::uint64_t start = clock.ElapsedMilliseconds();
        FailAllocation(failures + 1);
        const std::int32_t code = tested.call();
        reached = StopFailing();
        ASSERT_LT(clock.ElapsedMilliseconds() - start, 12'000U);
        ASSERT_TRUE(code == OSTRA_OK || code == OSTRA_FAILURE || code == OSTRA_UNKNOWN_FAILURE) << code;
        ASSERT_FALSE(instrument.Claimed());
        ASSERT_EQ(instrument.PendingTransfers(), 0U);
        ASSERT_TRUE(before.Settles()) << "before: " << before << "\nafter: " << ResourceCount::Take();
        if (!reached) {
            EXPECT_EQ(code == OSTRA_OK, tested.succeeds);
        }
        ASSERT_LT(failures, 100'000);
    }
    std::printf("%ld allocations failed in turn\n", failures - 1);
    EXPECT_GT(failures, 20);
    EXPECT_EQ(tested.call() == OSTRA_OK, tested.succeeds);
}

INSTANTIATE_TEST_SUITE_P(All, AllocationFailure,
                         testing::Combine(testing::Values(Transport::Native, Transport::UsbIo),
                                          testing::Range<std::size_t>(0, Cases.size())),
                         [](const auto& parameter) {
                             return std::string(Name(std::get<0>(parameter.param))) + "_" +
                                    Cases[std::get<1>(parameter.param)].name;
                         });

TEST(AllocationFailureOfACondition, SaysThatItsStateCannotBeMade) {
    using Utilities::Multithreading::Condition;
    Utilities::Multithreading::Mutex mutex("ostra-allocation-failure-test");
    std::vector<std::string> texts;
    for (bool isMade = false; !isMade;) {
        FailAllocation(static_cast<long>(texts.size()) + 1);
        try {
            const Condition condition(mutex);
            isMade = true;
        } catch (const std::exception& exception) {
            StopFailing();
            texts.emplace_back(exception.what());
        }
        StopFailing();
    }
    EXPECT_THAT(texts, testing::Contains("ConditionImpl::ConditionImpl() can't allocate!"));
}

}  // namespace
}  // namespace Varnholt::Tests
