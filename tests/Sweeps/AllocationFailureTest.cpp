// The exported functions with the first, second, third... allocation failing, until a call gets by without a
// failure.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <cstdlib>
#include <new>
#include <vector>

#include "ostra.h"
#include "Platform/EventScheduler.h"
#include "Platform/Threads.h"
#include "Platform/VirtualClock.h"
#include "Platform/WaitableObjects.h"
#include "Support/ResourceCount.h"
#include "Support/SimulatedHost.h"
#include "Utilities/Multithreading/Condition.h"

namespace {

/// Allocations until the one that fails; 0 while none is to fail.
std::atomic<long> untilFailure = 0;
std::atomic<bool> hasFailed = false;
/// The simulated instrument, the bus and the test itself are not what is tested.
thread_local int exempt = 0;

struct Exempt {
    Exempt() { ++exempt; }
    ~Exempt() { --exempt; }
    Exempt(const Exempt&) = delete;
    Exempt& operator=(const Exempt&) = delete;
};

bool MustFail() {
    if (exempt != 0 || untilFailure.load(std::memory_order_relaxed) == 0) {
        return false;
    }
    if (untilFailure.fetch_sub(1) == 1) {
        hasFailed = true;
        return true;
    }
    return false;
}

void* Allocate(std::size_t size) {
    return MustFail() ? nullptr : std::malloc(size == 0 ? 1 : size);
}

}  // namespace

void* operator new(std::size_t size) {
    if (void* const memory = Allocate(size)) {
        return memory;
    }
    throw std::bad_alloc();
}
void* operator new[](std::size_t size) {
    return operator new(size);
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    return Allocate(size);
}
void* operator new[](std::size_t size, const std::nothrow_t&) noexcept {
    return Allocate(size);
}
void operator delete(void* memory) noexcept {
    std::free(memory);
}
void operator delete[](void* memory) noexcept {
    std::free(memory);
}
void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}
void operator delete[](void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace Varnholt::Tests {
namespace {

using Platform::ErrorCode;
using Platform::Usb::Transfer;
using Platform::Usb::UsbDevice;
using TestSupport::ResourceCount;

/// A device whose own allocations do not fail.
class ExemptDevice final : public UsbDevice {
  public:
    explicit ExemptDevice(std::shared_ptr<UsbDevice> behind) : device(std::move(behind)) {}
    ~ExemptDevice() override {
        const Exempt guard;
        device.reset();
    }
    std::vector<Platform::Usb::EndpointInfo> Endpoints(ErrorCode& error) override {
        return device->Endpoints(error);
    }
    ErrorCode Claim() override {
        const Exempt guard;
        return device->Claim();
    }
    void Release() override {
        const Exempt guard;
        device->Release();
    }
    ErrorCode Submit(Transfer& transfer) override {
        const Exempt guard;
        return device->Submit(transfer);
    }
    void Cancel(Transfer& transfer) override {
        const Exempt guard;
        device->Cancel(transfer);
    }
    ErrorCode ClearHalt(std::uint8_t endpoint) override {
        const Exempt guard;
        return device->ClearHalt(endpoint);
    }

  private:
    std::shared_ptr<UsbDevice> device;
};

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

/// The virtual clock makes a thread when an event comes while a lock is held; that one is not to be counted.
void StartTheClocksOwnThread() {
    Platform::CriticalSection section;
    const Platform::CriticalSection::Holder held(section);
    Platform::ClockScheduler().CallAt(Platform::ClockScheduler().Now() + 1, [] {});
    Platform::SleepMilliseconds(1);
}

class AllocationFailure : public testing::TestWithParam<std::tuple<Transport, std::size_t>> {};

TEST_P(AllocationFailure, EndsInAResultCodeAndLeavesNothing) {
    const auto [transport, index] = GetParam();
    const Case& tested = Cases[index];
    Platform::VirtualClock clock(1);
    SimulatedHost host(transport);
    auto& instrument = host.Add("one");
    host.Bus().WrapDevices(
        [](const std::string&, auto device) { return std::make_shared<ExemptDevice>(device); });
    StartTheClocksOwnThread();
    ASSERT_EQ(tested.call() == OSTRA_OK, tested.succeeds) << b5ae189db26b2a1b("LastError");
    const ResourceCount before = ResourceCount::Take();

    long failures = 0;
    for (bool reached = true; reached; ++failures) {
        SCOPED_TRACE("allocation " + std::to_string(failures + 1));
        hasFailed = false;
        untilFailure = failures + 1;
        const std::uint64_t start = clock.ElapsedMilliseconds();
        const std::int32_t code = tested.call();
        untilFailure = 0;
        ASSERT_LT(clock.ElapsedMilliseconds() - start, 12'000U);
        reached = hasFailed;
        ASSERT_TRUE(code == OSTRA_OK || code == OSTRA_FAILURE || code == OSTRA_UNKNOWN_FAILURE) << code;
        ASSERT_FALSE(instrument.Claimed());
        ASSERT_EQ(instrument.PendingTransfers(), 0U);
        ASSERT_TRUE(before.Settles()) << ResourceCount::Take();
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
        untilFailure = static_cast<long>(texts.size()) + 1;
        try {
            const Condition condition(mutex);
            isMade = true;
        } catch (const std::exception& exception) {
            texts.emplace_back(exception.what());
        }
        untilFailure = 0;
    }
    EXPECT_THAT(texts, testing::Contains("ConditionImpl::ConditionImpl() can't allocate!"));
}

}  // namespace
}  // namespace Varnholt::Tests
