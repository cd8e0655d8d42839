#include <array>
#include <atomic>
#include <chrono>
#include <random>

#include "Descriptors.h"
#include "Platform/Drivers/DriverFixture.h"
#include "Platform/EventScheduler.h"
#include "SimulatedBus.h"
#include "Support/MeasuredBytes.h"
#if !defined(_WIN32)
#include "VirtualClock.h"
#endif

namespace Varnholt::Tests {
namespace {

/// How the reads of one round are ended besides by their data.
enum class Ending { Cancel, AbortFromOtherThread, CloseFromOtherThread, CloseAtOnce };

/// Two reads of an endless measurement are kept in flight, each ended by whichever comes first. All bytes
/// that the instrument has given away must be in the buffers, in order and once: what it sends next follows
/// on them. The threads pause for so many milliseconds at most.
class Round final {
  public:
    Round(unsigned seed, std::uint64_t bytesPerSecond, std::uint32_t longestPause)
        : random_(seed),
          ending_(static_cast<Ending>(seed % 4)),
          longestPause_(longestPause),
          instrument_(
              bus_.Add("port1", {.scanBytes = std::uint64_t{1} << 40, .bytesPerSecond = bytesPerSecond})) {}

    void Play() {
        Request measure;
        const auto block = NativeBlock(static_cast<std::uint8_t>(Protocol::Request::Measure), 0);
        files_->Start(main_, Platform::Operation::Control(Native::ControlVendorRequest, block, nullptr, 0),
                      measure.record);
        {
            Platform::TestThread other([this, pause = Pause()] { Interfere(pause); });
            Start(reads_[0]);
            for (std::size_t turn = 0; turn < 12 && !closed_; ++turn) {
                Start(reads_[(turn + 1) % 2]);
                if (ending_ == Ending::Cancel && random_() % 3 == 0) {
                    Platform::SleepMilliseconds(Pause());
                    EXPECT_TRUE(files_->CancelTransfers(pipe_));
                }
                Collect(reads_[turn % 2]);
            }
            if (ending_ == Ending::CloseAtOnce) {
                EXPECT_TRUE(files_->CloseFile(pipe_));
            } else if (ending_ == Ending::Cancel) {
                EXPECT_TRUE(files_->CancelTransfers(pipe_));
            }
            done_ = true;
        }
        // Only the one that was started last can still be on its way.
        Collect(reads_[0]);
        Collect(reads_[1]);
        if (ending_ == Ending::Cancel || ending_ == Ending::AbortFromOtherThread) {
            EXPECT_TRUE(files_->CloseFile(pipe_));
        }
        pipe_ = files_->Open("native/port1\\PIPE01");
        Start(reads_[0]);
        Collect(reads_[0]);
        EXPECT_EQ(collected_, instrument_.WithCommands([this](Simulator::Commands& commands) {
            return MeasuredBytes(commands, collected_.size());
        })) << "lost or repeated data";
        EXPECT_TRUE(files_->CloseFile(pipe_));
        EXPECT_TRUE(files_->CloseFile(main_));
    }
    /// Reads that were ended in the middle of their data.
    int CutOff() const { return cutOff_; }

  private:
    struct Read {
        Request request;
        Bytes buffer = Bytes(4 * Simulator::BulkPacketSize);
        bool started = false;
    };

    std::uint32_t Pause() { return static_cast<std::uint32_t>(random_() % (longestPause_ + 1)); }

    void Start(Read& read) {
        const auto length = static_cast<std::uint32_t>(read.buffer.size());
        read.started = files_->Start(pipe_, Platform::Operation::Read(read.buffer.data(), length),
                                     read.request.record) ||
                       Platform::LastError() == Errors::IoPending;
        EXPECT_TRUE(read.started || Platform::LastError() == Errors::InvalidHandle);
        closed_ = closed_ || !read.started;
    }

    void Collect(Read& read) {
        if (!read.started) {
            return;
        }
        read.started = false;
        std::uint32_t moved = 0;
        const bool succeeded = files_->GetResult(pipe_, read.request.record, moved, true);
        EXPECT_TRUE(succeeded || Platform::LastError() == Errors::OperationAborted) << Platform::LastError();
        EXPECT_TRUE(read.request.TakeSignal()) << "not signalled";
        EXPECT_FALSE(read.request.TakeSignal()) << "signalled twice";
        collected_.insert(collected_.end(), read.buffer.begin(),
                          read.buffer.begin() + static_cast<std::ptrdiff_t>(moved));
        cutOff_ += moved > 0 && moved < read.buffer.size() ? 1 : 0;
    }

    void Interfere(std::uint32_t pause) {
        if (ending_ == Ending::Cancel || ending_ == Ending::CloseAtOnce) {
            return;
        }
        Platform::SleepMilliseconds(pause);
        if (ending_ == Ending::CloseFromOtherThread) {
            EXPECT_TRUE(files_->CloseFile(pipe_));
            return;
        }
        const auto block = NativeBlock(0, 0, Protocol::BulkInEndpoint);
        while (!done_) {
            Request abort;
            EXPECT_TRUE(files_->Start(
                main_, Platform::Operation::Control(Native::ControlAbortPipe, block, nullptr, 0),
                abort.record));
            Platform::SleepMilliseconds(pause);
        }
    }

    std::minstd_rand random_;
    const Ending ending_;
    const std::uint32_t longestPause_;
    Simulator::SimulatedBus bus_{Platform::ClockScheduler()};
    Simulator::SimulatedInstrument& instrument_;
    const std::unique_ptr<Platform::DeviceFileSystem> files_ = Platform::Drivers::MakeDriverFileSystem(bus_);
    const Platform::Handle main_ = files_->Open("native/port1");
    Platform::Handle pipe_ = files_->Open("native/port1\\PIPE01");
    std::array<Read, 2> reads_;
    Bytes collected_;
    int cutOff_ = 0;
    bool closed_ = false;
    std::atomic<bool> done_{false};
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
        Round(seed, 300'000'000, 0).Play();
    }
}

#if !defined(_WIN32)
// The same with an order of threads that the seed decides: a round that fails can be played again.
TEST(Cancellation, LosesAndRepeatsNothingInAnySeededOrder) {
    constexpr unsigned Rounds = 5000;
    int cutOff = 0;
    for (unsigned seed = 1; seed <= Rounds && !testing::Test::HasFailure(); ++seed) {
        SCOPED_TRACE(testing::Message() << "seed " << seed);
        const Simulator::VirtualClock clock(seed);
        Round round(seed, 1000 * Simulator::BulkPacketSize, 5);  // a packet a millisecond
        round.Play();
        cutOff += round.CutOff();
    }
    EXPECT_GT(cutOff, static_cast<int>(Rounds / 2)) << "hardly a read was ended in the middle of its data";
}
#endif

}  // namespace
}  // namespace Varnholt::Tests
