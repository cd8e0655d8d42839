// The operations of the USBIO classes with the first, second, third... allocation failing, until one gets by
// without a failure.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <functional>
#include <iterator>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "Platform/Threads.h"
#include "Protocol/Instrument.h"
#include "Support/SimulatedHost.h"
#include "Sweeps/ExemptDevice.h"
#include "Sweeps/FailingAllocator.h"
#include "UsbIo/CUsbIoReader.h"
#include "UsbIo/CUsbIoWriter.h"
#include "VirtualClock.h"

namespace Varnholt::UsbIo {
namespace {

using namespace Protocol;
using namespace Protocol::UsbIoDriver;
using Tests::Exempt;
using Tests::FailAllocation;

/// What the operations that answer with a truth are taken to answer with.
constexpr std::uint32_t False = Status::Failed;
constexpr std::uint32_t StatusOf(bool succeeded) {
    return succeeded ? Status::Success : False;
}

/// A configured instrument, and a pipe that is bound to its data and delivers none.
struct World {
    World() {
        host.Add("one");
        host.Bus().WrapDevices(
            [](const std::string&, auto opened) { return std::make_shared<Tests::ExemptDevice>(opened); });
        const Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
        EXPECT_EQ(device.Open(0, list, &InterfaceClass), Status::Success);
        EXPECT_EQ(device.SetConfiguration({0, interfaces}), Status::Success);
        EXPECT_EQ(pipe.Bind(0, BulkInEndpoint, list, &InterfaceClass), Status::Success);
    }
    ~World() { EXPECT_EQ(host.Bus().Instrument("one").PendingTransfers(), 0U); }

    static constexpr std::array<InterfaceSetting, 1> interfaces{{{0, 0, 65536}}};
    Tests::SimulatedHost host{Tests::Transport::UsbIo};
    CUsbIo device;
    CUsbIoPipe pipe;
    static constexpr std::uint32_t Room = 64;
    std::array<std::uint8_t, Room> data{};
    std::uint32_t size = Room;
    ClassOrVendorRequest request{};
};

std::uint32_t Make(World&) {
    CUsbIo device;
    CUsbIoPipe pipe;
    CUsbIoReader reader;
    const CUsbIoBufferPool pool;
    const CUsbIoBuffer buffer(64);
    return StatusOf(buffer.Buffer != nullptr);
}

std::uint32_t Open(World&) {
    Platform::DeviceList list = nullptr;
    {
        const Exempt guard;
        list = CUsbIo::CreateDeviceList(&InterfaceClass);
    }
    CUsbIo device;
    const std::uint32_t status = device.Open(0, list, &InterfaceClass);
    EXPECT_EQ(device.IsOpen(), status == Status::Success);
    CUsbIo::DestroyDeviceList(list);
    return status;
}

std::uint32_t BindPipe(World& world) {
    world.pipe.Close();
    const Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
    if (!list) {
        return Status::NoMemory;
    }
    CUsbIoPipe other;
    return other.Bind(0, BulkInEndpoint, list, &InterfaceClass);
}

std::uint32_t Configure(World& world) {
    {
        const Exempt guard;
        world.pipe.Close();
        world.device.Close();  // the next configuration opens the device anew
        const Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
        EXPECT_EQ(world.device.Open(0, list, &InterfaceClass), Status::Success);
    }
    const std::uint32_t status = world.device.SetConfiguration({0, World::interfaces});
    return status != Status::Success ? status : world.device.UnconfigureDevice();
}

std::uint32_t Ask(World& world) {
    world.size = 8;
    world.request.type = RequestBlock::TypeVendor;
    world.request.request = static_cast<std::uint8_t>(Request::GetMisc);
    return world.device.ClassOrVendorInRequest(world.data.data(), world.size, world.request);
}

std::uint32_t ReadUntilEvent(World& world) {
    const Platform::OwnedHandle event(Platform::MakeAutoResetEvent());
    if (!event) {
        return Status::NoMemory;
    }
    Platform::SignalEvent(event.Get());
    world.size = World::Room;
    return world.pipe.ReadSyncUntil(world.data.data(), world.size, Platform::Infinite, event.Get());
}

/// A read that is started, waited for in vain and aborted.
std::uint32_t Abort(World& world) {
    CUsbIoBuffer buffer(world.data.data(), World::Room);
    buffer.NumberOfBytesToTransfer = buffer.Size;
    if (!world.pipe.Read(buffer)) {
        return buffer.Status;
    }
    const Platform::OwnedHandle event(Platform::MakeAutoResetEvent());
    if (const std::uint32_t status = world.pipe.WaitForCompletion(buffer, 10, event.Get());
        status != Status::TimedOut) {
        return status;
    }
    const std::uint32_t status = world.pipe.AbortPipe();
    return status != Status::Success ? status : world.pipe.WaitForCompletion(buffer, Platform::Infinite);
}

std::uint32_t UsePool(World&) {
    CUsbIoBufferPool pool;
    const bool allocated = pool.Allocate(64, 3);
    EXPECT_EQ(pool.CurrentCount(), allocated ? 3U : 0U);
    if (CUsbIoBuffer* const buffer = pool.Get()) {
        pool.Put(buffer);
    }
    pool.Free();
    return StatusOf(allocated);
}

/// Lets the thread of a stream run for a while.
template <class Stream>
std::uint32_t RunStream(World& world) {
    world.pipe.Close();
    Stream stream;
    {
        const Exempt guard;
        const Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
        EXPECT_EQ(stream.Bind(0, std::is_same_v<Stream, CUsbIoReader> ? BulkInEndpoint : BulkOutEndpoint,
                              list, &InterfaceClass),
                  Status::Success);
    }
    if (!stream.AllocateBuffers(64, 3) || !stream.StartThread()) {
        return False;
    }
    Platform::SleepMilliseconds(10);
    return StatusOf(stream.ShutdownThread());
}

struct Case {
    const char* name;
    std::uint32_t (*call)(World&);
    std::uint32_t status;  ///< when no allocation fails
};
constexpr std::array Cases{
    Case{"Make", &Make, Status::Success},
    Case{"Open", &Open, Status::Success},
    Case{"BindPipe", &BindPipe, Status::Success},
    Case{"Configure", &Configure, Status::Success},
    Case{"Ask", &Ask, Status::Success},
    Case{"ReadUntilEvent", &ReadUntilEvent, Status::UserEvent},
    Case{"Abort", &Abort, Status::Cancelled},
    Case{"UsePool", &UsePool, Status::Success},
    Case{"Reader", &RunStream<CUsbIoReader>, Status::Success},
    Case{"Writer", &RunStream<CUsbIoWriter>, Status::Success},
};

bool TellsOfMemory(std::uint32_t status) {
    constexpr std::array codes{False, Status::NoMemory, Platform::Errors::NotEnoughMemory,
                               Platform::Errors::NoSystemResources};
    return std::ranges::find(codes, status) != codes.end();
}

class UsbIoAllocation : public testing::TestWithParam<Case> {};

TEST_P(UsbIoAllocation, EveryFailureIsAStatus) {
    const Case& tested = GetParam();
    const Simulator::VirtualClock clock(1);
    Tests::StartTheClocksOwnThread();
    int failures = 0;
    for (bool reached = true; reached; ++failures) {
        SCOPED_TRACE("allocation " + std::to_string(failures + 1));
        World world;
        FailAllocation(failures + 1);
        const std::uint32_t status = tested.call(world);
        reached = Tests::StopFailing();
        EXPECT_TRUE(status == tested.status || (reached && TellsOfMemory(status))) << std::hex << status;
        EXPECT_EQ(tested.call(world), tested.status) << "nothing is left of the failure";
        ASSERT_LT(failures, 1000);
    }
    std::printf("%d allocations failed in turn\n", failures - 1);
}

INSTANTIATE_TEST_SUITE_P(All, UsbIoAllocation, testing::ValuesIn(Cases),
                         [](const auto& parameter) { return std::string(parameter.param.name); });

/// What the platform keeps of a thread that it did not start takes no memory either.
TEST(UsbIoAllocationOfAThread, ItsFirstCallTakesNoMemory) {
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
            failed = Tests::StopFailing();
        }).join();
        EXPECT_FALSE(failed) << "call " << &call - std::begin(calls);
    }
}

}  // namespace
}  // namespace Varnholt::UsbIo
