#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <random>
#include <thread>
#include <vector>

#include "Platform/Drivers/DriverFixture.h"

namespace Varnholt::Tests {
namespace {

namespace Errors = Platform::Errors;
using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;

/// Delivers an endless stream whose bytes tell their place, so that one that is lost or counted twice shows.
/// One thread completes transfers; cancellations come from any other and may carry data, as on a real host
/// controller.
class StreamingDevice final : public Platform::Usb::UsbDevice {
  public:
    explicit StreamingDevice(unsigned seed) : random(seed), worker([this] { Run(); }) {}
    ~StreamingDevice() override {
        {
            const std::lock_guard guard(lock);
            ending = true;
        }
        changed.notify_all();
        worker.join();
        EXPECT_TRUE(pending.empty());
    }

    std::vector<Platform::Usb::EndpointInfo> Endpoints() override {
        return {{Protocol::BulkInEndpoint, 2, 512}};
    }
    Platform::ErrorCode Claim() override { return Errors::Success; }
    void Release() override {}
    Platform::ErrorCode ClearHalt(std::uint8_t) override { return Errors::Success; }

    Platform::ErrorCode Submit(Transfer& transfer) override {
        std::unique_lock hold(lock);
        if (random() % 8 == 0 && pending.empty()) {
            Fill(transfer, transfer.length, TransferStatus::Completed);
            hold.unlock();
            transfer.client->TransferCompleted(transfer);
            return Errors::Success;
        }
        pending.push_back(&transfer);
        hold.unlock();
        changed.notify_all();
        return Errors::Success;
    }

    void Cancel(Transfer& transfer) override {
        {
            const std::lock_guard guard(lock);
            const auto found = std::find(pending.begin(), pending.end(), &transfer);
            if (found == pending.end()) {
                return;
            }
            // Only the oldest transfer of an endpoint can have got data.
            const bool isOldest = found == pending.begin();
            pending.erase(found);
            Fill(transfer, isOldest ? static_cast<std::uint32_t>(random() % (transfer.length + 1)) : 0,
                 TransferStatus::Cancelled);
        }
        transfer.client->TransferCompleted(transfer);
    }

    std::uint64_t Delivered() {
        const std::lock_guard guard(lock);
        return delivered;
    }

  private:
    void Fill(Transfer& transfer, std::uint32_t count, TransferStatus status) {
        std::generate_n(transfer.data, count, [this] { return static_cast<std::uint8_t>(delivered++ * 7); });
        transfer.actualLength = count;
        transfer.status = status;
    }

    void Run() {
        std::unique_lock hold(lock);
        for (;;) {
            changed.wait(hold, [this] { return ending || !pending.empty(); });
            if (pending.empty()) {
                return;
            }
            const auto pause = static_cast<unsigned>(random() % 64);
            hold.unlock();
            for (unsigned i = 0; i < pause; ++i) {
                std::this_thread::yield();
            }
            hold.lock();
            if (pending.empty()) {
                continue;
            }
            Transfer& transfer = *pending.front();
            pending.pop_front();
            Fill(transfer, transfer.length, TransferStatus::Completed);
            hold.unlock();
            transfer.client->TransferCompleted(transfer);
            hold.lock();
        }
    }

    std::mutex lock;
    std::condition_variable changed;
    std::minstd_rand random;        // guarded by `lock`
    std::deque<Transfer*> pending;  // guarded by `lock`
    std::uint64_t delivered = 0;    // guarded by `lock`
    bool ending = false;            // guarded by `lock`
    std::thread worker;
};

class StreamingBus final : public Platform::Usb::UsbBus {
  public:
    explicit StreamingBus(unsigned seed) : device(std::make_shared<StreamingDevice>(seed)) {}
    const std::shared_ptr<StreamingDevice> device;
    std::vector<std::string> List() override { return {"port1"}; }
    std::shared_ptr<Platform::Usb::UsbDevice> Open(const std::string&, Platform::ErrorCode&) override {
        return device;
    }
};

/// How the reads of one round are ended besides by their data.
enum class Ending { Cancel, AbortFromOtherThread, CloseFromOtherThread, CloseAtOnce };

/// Two reads are kept in flight, each ended by whichever comes first. All bytes that the device has given
/// away must be in the buffers, in order and once.
void PlayRound(unsigned seed) {
    std::minstd_rand random(seed);
    StreamingBus bus(seed);
    const auto files = Platform::Drivers::MakeDriverFileSystem(bus);
    const auto main = files->Open("native/port1");
    const auto pipe = files->Open("native/port1\\PIPE01");
    const auto ending = static_cast<Ending>(seed % 4);

    struct Read {
        Request request;
        Bytes buffer = Bytes(16);
        bool started = false;
    };
    std::array<Read, 2> reads;
    std::uint64_t collected = 0;
    bool closed = false;
    const auto start = [&](Read& read) {
        read.started = files->StartRead(pipe, read.buffer.data(), 16, read.request.record) ||
                       Platform::LastError() == Errors::IoPending;
        closed = closed || !read.started;
    };
    const auto collect = [&](Read& read) {
        if (!read.started) {
            return;
        }
        std::uint32_t moved = 0;
        const bool succeeded = files->GetResult(pipe, read.request.record, moved, true);
        EXPECT_TRUE(succeeded || Platform::LastError() == Errors::OperationAborted) << Platform::LastError();
        EXPECT_TRUE(read.request.TakeSignal()) << "not signalled";
        EXPECT_FALSE(read.request.TakeSignal()) << "signalled twice";
        for (std::uint32_t i = 0; i < moved; ++i) {
            ASSERT_EQ(read.buffer[i], static_cast<std::uint8_t>(collected++ * 7)) << "lost or repeated data";
        }
    };

    std::atomic<bool> done{false};
    std::thread other([&, pause = static_cast<unsigned>(random() % 256)] {
        if (ending == Ending::Cancel || ending == Ending::CloseAtOnce) {
            return;
        }
        for (unsigned i = 0; i < pause; ++i) {
            std::this_thread::yield();
        }
        if (ending == Ending::CloseFromOtherThread) {
            EXPECT_TRUE(files->CloseFile(pipe));
            return;
        }
        while (!done) {
            Request abort;
            const auto block = NativeBlock(0, 0, Protocol::BulkInEndpoint);
            EXPECT_TRUE(files->StartControl(main, Protocol::NativeDriver::ControlAbortPipe, block.data(), 10,
                                            nullptr, 0, abort.record));
            std::this_thread::yield();
        }
    });
    start(reads[0]);
    for (std::size_t turn = 0; turn < 12 && !closed; ++turn) {
        start(reads[(turn + 1) % 2]);
        if (ending == Ending::Cancel && random() % 3 == 0) {
            EXPECT_TRUE(files->CancelTransfers(pipe));
        }
        collect(reads[turn % 2]);
        reads[turn % 2].started = false;
    }
    if (ending == Ending::CloseAtOnce) {
        EXPECT_TRUE(files->CloseFile(pipe));
    } else if (ending == Ending::Cancel) {
        files->CancelTransfers(pipe);
    }
    done = true;
    other.join();
    // Whichever of the two still counts was started last.
    collect(reads[0]);
    collect(reads[1]);
    EXPECT_EQ(collected, bus.device->Delivered()) << "bytes that the device gave away and nobody counted";
    if (ending != Ending::CloseAtOnce && ending != Ending::CloseFromOtherThread) {
        EXPECT_TRUE(files->CloseFile(pipe));
    }
    EXPECT_TRUE(files->CloseFile(main));
}

TEST(Cancellation, LosesAndRepeatsNothingInAnyOrder) {
    constexpr unsigned Rounds = 4000;
    // Where threads and waits cost more there are fewer rounds.
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(8);
    for (unsigned seed = 1; seed <= Rounds && !testing::Test::HasFailure(); ++seed) {
        if (std::chrono::steady_clock::now() > end) {
            break;
        }
        SCOPED_TRACE(testing::Message() << "seed " << seed);
        PlayRound(seed);
    }
}

}  // namespace
}  // namespace Varnholt::Tests
