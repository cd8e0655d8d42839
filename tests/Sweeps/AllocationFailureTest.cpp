// The first, second, third... allocation of a call fails, until one gets by without a failure.
#include <gmock/gmock.h>

#include <cstdio>
#include <cstdlib>
#include <new>

#include "ostra.h"
#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"
#include "Support/ResourceCount.h"
#include "Support/SimulatedHost.h"
#include "UsbIo/CUsbIoReader.h"
#include "UsbIo/CUsbIoWriter.h"
#include "Utilities/Multithreading/Condition.h"
#include "VirtualClock.h"

namespace {

/// Allocations until the one that fails; 0 while none is to fail.
std::atomic<long> untilFailure = 0;
std::atomic<bool> hasFailed = false;
thread_local int exempt = 0;

void* Allocate(std::size_t size) {
    if (exempt == 0 && untilFailure.load(std::memory_order_relaxed) != 0 && untilFailure.fetch_sub(1) == 1) {
        hasFailed = true;
        return nullptr;
    }
    return std::malloc(size == 0 ? 1 : size);
}

}  // namespace

// The forms for arrays stand on these, but for sanitizers, which have theirs.
void* operator new(std::size_t size) {
    if (void* const memory = Allocate(size)) {
        return memory;
    }
    throw std::bad_alloc();
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    return Allocate(size);
}
void operator delete(void* memory) noexcept {
    std::free(memory);
}
void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace Varnholt::Tests {
namespace {

using Platform::Usb::UsbDevice;
using TestSupport::ResourceCount;

/// While it lives, the allocations of this thread neither fail nor count. The simulated instrument, the bus
/// and a test itself are not what is tested.
class Exempt final {
  public:
    Exempt() { ++exempt; }
    ~Exempt() { --exempt; }
    Exempt(const Exempt&) = delete;
    Exempt& operator=(const Exempt&) = delete;
};

/// Lets the allocation fail that is `number` from now, counted from 1, on whatever thread.
void FailAllocation(long number) {
    hasFailed = false;
    untilFailure = number;
}
/// No allocation fails any more. Answers whether one has failed since `FailAllocation`.
bool StopFailing() {
    untilFailure = 0;
    return hasFailed;
}

/// A device whose own allocations do not fail.
class ExemptDevice final : public UsbDevice {
    template <class Function, class... Argument>
    auto Call(Function function, Argument&... argument) {
        const Exempt guard;
        return (*device_.*function)(argument...);
    }

  public:
    explicit ExemptDevice(std::shared_ptr<UsbDevice> behind) : device_(std::move(behind)) {}
    ~ExemptDevice() override {
        const Exempt guard;
        device_.reset();
    }
    std::vector<Platform::Usb::EndpointInfo> Endpoints(Platform::ErrorCode& error) override {
        return device_->Endpoints(error);
    }
    Platform::ErrorCode Claim() override { return Call(&UsbDevice::Claim); }
    void Release() override { Call(&UsbDevice::Release); }
    Platform::ErrorCode Submit(Platform::Usb::Transfer& transfer) override {
        return Call(&UsbDevice::Submit, transfer);
    }
    void Cancel(Platform::Usb::Transfer& transfer) override { Call(&UsbDevice::Cancel, transfer); }
    Platform::ErrorCode ClearHalt(std::uint8_t endpoint) override {
        return Call(&UsbDevice::ClearHalt, endpoint);
    }

  private:
    std::shared_ptr<UsbDevice> device_;
};

/// The virtual clock makes a thread when an event comes while a lock is held; that one is not to be counted.
void StartTheClocksOwnThread() {
    Platform::RecursiveMutex section;
    const std::lock_guard held(section);
    Platform::ClockScheduler().CallAt(Platform::ClockScheduler().Now() + 1, [] {});
    Platform::SleepMilliseconds(1);
}

std::array<std::int32_t, OSTRA_READOUT_VALUES> values;
constexpr std::array<std::uint8_t, OSTRA_IMAGE_SIZE> Image{};

/// An exported function.
struct Case {
    const char* name;
    std::int32_t (*call)();
    bool succeeds;  ///< when no allocation fails
};
constexpr std::array Cases{
    Case{"Readout", [] { return d4fb86cecc88582a(values.data(), ""); }, true},
    Case{"ImageWrite", [] { return f3355d91d5df0e0b(Image.data(), ""); }, true},
    Case{"NamedReadout",
         [] {
             return d4fb86cecc88582a(values.data(), "an instrument that is not connected, with a long name");
         },
         false}};

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
        ASSERT_TRUE(before.Settles()) << "before: " << before << "\nafter: " << ResourceCount();
        if (!reached) {
            EXPECT_EQ(code == OSTRA_OK, tested.succeeds);
        }
        ASSERT_LT(failures, 100'000);
    }
    std::printf("%ld allocations failed in turn\n", failures - 1);
    EXPECT_GT(failures, 20);
    EXPECT_EQ(tested.call() == OSTRA_OK, tested.succeeds);
}

OSTRA_SWEEP_BOTH_TRANSPORTS(AllocationFailure, Cases);

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

// The classes of USBIO, whose operations end with a status.

using namespace UsbIo;
using namespace Protocol::UsbIoDriver;
using Protocol::BulkInEndpoint;

constexpr std::uint32_t StatusOf(bool succeeded) {
    return succeeded ? Status::Success : Status::NoMemory;
}

std::uint32_t Open() {
    const Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
    CUsbIo device;
    const std::uint32_t status = list ? device.Open(0, list, &InterfaceClass) : Status::NoMemory;
    EXPECT_EQ(device.IsOpen(), status == Status::Success);
    return status;
}

std::uint32_t UsePool() {
    CUsbIoBufferPool pool;
    const bool allocated = pool.Allocate(64, 3);
    EXPECT_EQ(pool.CurrentCount(), allocated ? 3U : 0U);
    return StatusOf(allocated && CUsbIoBuffer(64).Buffer != nullptr);
}

/// Lets the thread of a stream run for a while.
template <class Stream>
std::uint32_t RunStream() {
    Stream stream;
    {
        const Exempt guard;
        const Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
        EXPECT_EQ(stream.Open(0, list, &InterfaceClass), Status::Success);
        EXPECT_EQ(stream.SetConfiguration({0, std::array<InterfaceSetting, 1>{{{0, 0, 65536}}}}),
                  Status::Success);
        EXPECT_EQ(stream.Bind(0, BulkInEndpoint, list, &InterfaceClass), Status::Success);
    }
    const bool ran = stream.AllocateBuffers(64, 3) && stream.StartThread();
    Platform::SleepMilliseconds(10);
    return StatusOf(stream.ShutdownThread() && ran);
}

TEST(UsbIoAllocation, EveryFailureIsAStatus) {
    const Simulator::VirtualClock clock(1);
    StartTheClocksOwnThread();
    for (const auto& [name, run] : {std::pair("Open", &Open),
                                    {"UsePool", &UsePool},
                                    {"Reader", &RunStream<CUsbIoReader>},
                                    {"Writer", &RunStream<CUsbIoWriter>}}) {
        bool reached = true;
        for (int failures = 0; reached && failures < 1000; ++failures) {
            SCOPED_TRACE(name + std::string(", allocation ") + std::to_string(failures + 1));
            SimulatedHost host(Transport::UsbIo);
            host.Add("one");
            host.Bus().WrapDevices(
                [](const std::string&, auto opened) { return std::make_shared<ExemptDevice>(opened); });
            FailAllocation(failures + 1);
            const std::uint32_t status = run();
            reached = StopFailing();
            EXPECT_THAT(status,
                        testing::AnyOf(Status::Success, Status::NoMemory, Platform::Errors::NotEnoughMemory,
                                       Platform::Errors::NoSystemResources));
            EXPECT_TRUE(reached || status == Status::Success);
            EXPECT_EQ(run(), Status::Success) << "nothing is left of the failure";
            EXPECT_EQ(host.Bus().Instrument("one").PendingTransfers(), 0U);
        }
        EXPECT_FALSE(reached) << name;
    }
}

/// What the platform keeps of a thread that it did not start takes no memory either.
TEST(AllocationFailureOfAThread, ItsFirstCallTakesNoMemory) {
    const Platform::OwnedHandle event(Platform::MakeAutoResetEvent());
    Platform::RecursiveMutex section;
    const std::array handles{event.Get(), event.Get()};
    const std::function<void()> calls[] = {
        [&] { const std::lock_guard hold(section); }, [&] { Platform::SignalEvent(event.Get()); },
        [&] { Platform::WaitAny(handles, 1); },       [] { Platform::Close(Platform::NoHandle); },
        [] { Platform::SleepMilliseconds(1); },
    };
    for (const auto& call : calls) {
        bool failed = false;
        std::thread([&] {
            FailAllocation(1);
            call();
            failed = StopFailing();
        }).join();
        EXPECT_FALSE(failed) << "call " << &call - std::begin(calls);
    }
}

}  // namespace
}  // namespace Varnholt::Tests
