#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <chrono>
#include <random>

#include "Platform/Drivers/DriverFixture.h"
#include "Platform/Drivers/StreamingDevice.h"
#include "Platform/TestThread.h"
#include "Platform/Threads.h"
#if !defined(_WIN32)
#include "Platform/VirtualClock.h"
#endif

namespace Varnholt::Tests {
namespace {

namespace Errors = Platform::Errors;

/// How the reads of one round are ended besides by their data.
enum class Ending { Cancel, AbortFromOtherThread, CloseFromOtherThread, CloseAtOnce };

/// Two reads are kept in flight, each ended by whichever comes first. All bytes that the device has given
/// away must be in the buffers, in order and once.
template <class Device>
class Round final {
  public:
    explicit Round(unsigned seed) : random(seed), ending(static_cast<Ending>(seed % 4)), bus(seed) {}

    void Play() {
        Platform::TestThread other([this, pause = random() % 64] { Interfere(pause); });
        Start(reads[0]);
        for (std::size_t turn = 0; turn < 12 && !closed; ++turn) {
            Start(reads[(turn + 1) % 2]);
            if (ending == Ending::Cancel && random() % 3 == 0) {
                EXPECT_TRUE(files->CancelTransfers(pipe));
            }
            Collect(reads[turn % 2]);
        }
        if (ending == Ending::CloseAtOnce) {
            EXPECT_TRUE(files->CloseFile(pipe));
        } else if (ending == Ending::Cancel) {
            EXPECT_TRUE(files->CancelTransfers(pipe));
        }
        done = true;
        other.Join();
        // Only the one that was started last can still be on its way.
        Collect(reads[0]);
        Collect(reads[1]);
        EXPECT_EQ(collected, bus.device->Delivered()) << "bytes that the device gave away and nobody counted";
        if (ending == Ending::Cancel || ending == Ending::AbortFromOtherThread) {
            EXPECT_TRUE(files->CloseFile(pipe));
        }
        EXPECT_TRUE(files->CloseFile(main));
    }

  private:
    struct Read {
        Request request;
        Bytes buffer = Bytes(16);
        bool started = false;
    };

    void Start(Read& read) {
        read.started = files->StartRead(pipe, read.buffer.data(), 16, read.request.record) ||
                       Platform::LastError() == Errors::IoPending;
        EXPECT_TRUE(read.started || Platform::LastError() == Errors::InvalidHandle);
        closed = closed || !read.started;
    }

    void Collect(Read& read) {
        if (!read.started) {
            return;
        }
        read.started = false;
        std::uint32_t moved = 0;
        const bool succeeded = files->GetResult(pipe, read.request.record, moved, true);
        EXPECT_TRUE(succeeded || Platform::LastError() == Errors::OperationAborted) << Platform::LastError();
        EXPECT_TRUE(read.request.TakeSignal()) << "not signalled";
        EXPECT_FALSE(read.request.TakeSignal()) << "signalled twice";
        for (std::uint32_t i = 0; i < moved; ++i) {
            ASSERT_EQ(read.buffer[i], StreamingDevice::ByteAt(collected++)) << "lost or repeated data";
        }
    }

    void Interfere(std::uint_fast32_t pause) {
        if (ending == Ending::Cancel || ending == Ending::CloseAtOnce) {
            return;
        }
        for (std::uint_fast32_t i = 0; i < pause; ++i) {
            Platform::SleepMilliseconds(0);
        }
        if (ending == Ending::CloseFromOtherThread) {
            EXPECT_TRUE(files->CloseFile(pipe));
            return;
        }
        const auto block = NativeBlock(0, 0, Protocol::BulkInEndpoint);
        while (!done) {
            Request abort;
            EXPECT_TRUE(files->StartControl(main, Protocol::NativeDriver::ControlAbortPipe, block.data(), 10,
                                            nullptr, 0, abort.record));
            Platform::SleepMilliseconds(0);
        }
    }

    std::minstd_rand random;
    const Ending ending;
    StreamingBus<Device> bus;
    const std::unique_ptr<Platform::DeviceFileSystem> files = Platform::Drivers::MakeDriverFileSystem(bus);
    const Platform::Handle main = files->Open("native/port1");
    const Platform::Handle pipe = files->Open("native/port1\\PIPE01");
    std::array<Read, 2> reads;
    std::uint64_t collected = 0;
    bool closed = false;
    std::atomic<bool> done{false};
};

TEST(Cancellation, LosesAndRepeatsNothingWhereThreadsRace) {
    constexpr unsigned Rounds = 4000;
    // Where threads and waits cost more there are fewer rounds.
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(8);
    for (unsigned seed = 1; seed <= Rounds && !testing::Test::HasFailure(); ++seed) {
        if (std::chrono::steady_clock::now() > end) {
            break;
        }
        SCOPED_TRACE(testing::Message() << "seed " << seed);
        Round<ThreadedStreamingDevice>(seed).Play();
    }
}

#if !defined(_WIN32)
// The same with an order of threads that the seed decides: a round that fails can be played again.
TEST(Cancellation, LosesAndRepeatsNothingInAnySeededOrder) {
    constexpr unsigned Rounds = 5000;
    for (unsigned seed = 1; seed <= Rounds && !testing::Test::HasFailure(); ++seed) {
        SCOPED_TRACE(testing::Message() << "seed " << seed);
        const Platform::VirtualClock clock(seed);
        Round<ScheduledStreamingDevice>(seed).Play();
    }
}
#endif

}  // namespace
}  // namespace Varnholt::Tests
