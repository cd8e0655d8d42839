#include <algorithm>
#include <atomic>

#include "Protocol/Instrument.h"
#include "Support/DriverTest.h"
#include "UsbIo/CUsbIoReader.h"
#include "UsbIo/CUsbIoWriter.h"

namespace Varnholt::UsbIo {
namespace {

using namespace Protocol::UsbIoDriver;
using namespace Protocol;
using namespace Tests;

constexpr std::uint32_t Limit = 10000;

/// A stream that tells of its errors and when its thread is through.
template <class Base>
class Watched : public Base {
  public:
    bool WaitForExit() { return Platform::Wait(exited_.Get(), Limit) == Platform::WaitResult::Signalled; }
    std::vector<std::uint32_t> Errors() {
        const std::lock_guard held(lock_);
        return errors_;
    }

  protected:
    std::mutex lock_;

  private:
    void OnBufferError(CUsbIoBuffer& buffer) override {
        const std::lock_guard held(lock_);
        errors_.push_back(buffer.Status);
    }
    void OnThreadExit() override { Platform::SignalEvent(exited_.Get()); }

    Platform::OwnedHandle exited_{Platform::MakeAutoResetEvent()};
    std::vector<std::uint32_t> errors_;
};

/// Collects what it reads.
class Reader final : public Watched<CUsbIoReader> {
  public:
    std::vector<std::uint8_t> Received() {
        const std::lock_guard held(lock_);
        return received_;
    }
    std::uint32_t FreeBufferCount() { return BufferPool.CurrentCount(); }

    std::uint32_t readsWanted = 0xFFFFFFFF;  ///< then `OperationFinished`
    std::function<void()> onCompleted;

  private:
    void PrepareBuffer(CUsbIoBuffer& buffer) override {
        CUsbIoReader::PrepareBuffer(buffer);
        buffer.OperationFinished = readsWanted == 0;
        readsWanted -= readsWanted > 0;
    }
    void OnBufferCompleted(CUsbIoBuffer& buffer) override {
        {
            const std::lock_guard held(lock_);
            const auto* const bytes = static_cast<const std::uint8_t*>(buffer.Buffer);
            received_.insert(received_.end(), bytes, bytes + buffer.BytesTransferred);
            EXPECT_TRUE(std::all_of(bytes + buffer.BytesTransferred, bytes + buffer.Size,
                                    [](std::uint8_t byte) { return byte == 0; }));
        }
        if (onCompleted) {
            onCompleted();
        }
    }

    std::vector<std::uint8_t> received_;
};

/// Sends the numbers from 1 on, one for each buffer.
class Writer final : public Watched<CUsbIoWriter> {
  public:
    std::uint8_t writesWanted = 0;
    std::atomic<int> completed = 0;

  private:
    void PrepareBuffer(CUsbIoBuffer& buffer) override {
        CUsbIoWriter::PrepareBuffer(buffer);
        buffer.NumberOfBytesToTransfer = 1;
        buffer.OperationFinished = sent_ == writesWanted;
        *static_cast<std::uint8_t*>(buffer.Buffer) = ++sent_;
    }
    void OnBufferCompleted(CUsbIoBuffer&) override { ++completed; }

    std::uint8_t sent_ = 0;
};

class CUsbIoThreadTest : public Tests::DriverTest {
  protected:
    void SetUp() override { Bind(reader_, BulkInEndpoint); }

    template <class Stream>
    void Bind(Stream& stream, std::uint8_t endpoint) {
        ASSERT_EQ(stream.Bind(0, endpoint, nullptr, nullptr), Status::Success);
        driver_.TakeTranscript();
    }
    void Start(std::uint32_t buffers) {
        ASSERT_TRUE(reader_.AllocateBuffers(8, buffers));
        ASSERT_TRUE(reader_.StartThread());
    }
    void ExpectEnd(std::uint32_t buffers) {
        EXPECT_TRUE(reader_.ShutdownThread());
        EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
        EXPECT_EQ(reader_.FreeBufferCount(), buffers) << "also the one that was at hand";
        EXPECT_TRUE(reader_.ShutdownThread());
    }

    Reader reader_;
};

TEST_F(CUsbIoThreadTest, ReadsAStreamInOrder) {
    std::vector<std::uint8_t> expected;
    for (std::uint8_t i = 0; i < 10; ++i) {
        const Tests::Bytes data(1U + i % 2U, i);  // what a buffer held before must not show behind it
        driver_.Script(BulkInEndpoint, {.data = data, .after = i % 3U * 2U});
        expected.insert(expected.end(), data.begin(), data.end());
    }
    reader_.readsWanted = 10;
    reader_.ThreadPriority = -1;
    std::atomic<int> priority = 0;
    reader_.onCompleted = [&] { priority = Platform::CurrentThreadPriority(); };
    Start(3);
    EXPECT_FALSE(reader_.StartThread());
    EXPECT_TRUE(reader_.WaitForExit());
    EXPECT_THAT(reader_.Received(), ElementsAreArray(expected));
    EXPECT_EQ(priority, -1);
    ExpectEnd(3);
}

TEST_F(CUsbIoThreadTest, NeedsAnEventAndRoomToReadInto) {
    Tests::FailCalls("MakeAutoResetEvent");
    EXPECT_FALSE(reader_.StartThread());
    Platform::InstallCallFilter({});
    for (const std::uint32_t size : {0U, 1U}) {
        Reader reader;
        Bind(reader, BulkInEndpoint);
        driver_.Script(BulkInEndpoint, {.data = {7}, .after = 1});
        reader.readsWanted = 1;
        ASSERT_TRUE(reader.AllocateBuffers(size, 1));
        ASSERT_TRUE(reader.StartThread());
        EXPECT_TRUE(reader.WaitForExit());
        EXPECT_EQ(reader.Received().size(), size);
        EXPECT_TRUE(reader.ShutdownThread());
    }
}

TEST_F(CUsbIoThreadTest, KeepsAReadRunningForEachBuffer) {
    driver_.Script(BulkInEndpoint, {.data = {1}, .after = 1});
    Start(4);
    WaitUntil([&] { return !reader_.Received().empty() && driver_.Running(BulkInEndpoint) == 4; });
    const Tests::Stopwatch stopwatch(clock_);
    ExpectEnd(4);
    stopwatch.ExpectAtMost(0);
    EXPECT_THAT(driver_.TakeTranscript(), testing::Contains("control 80942084 /")) << "aborted";
}

TEST_F(CUsbIoThreadTest, EndsAfterTooManyErrorsInARow) {
    constexpr std::uint32_t Bad = Status::EndpointHalted, Down = Status::DevicePoweredDown;
    // Behind the transfers of these statuses another one would fail, too.
    const auto run = [&](auto& stream, std::uint8_t endpoint, const auto& statuses, std::uint32_t most) {
        Bind(stream, endpoint);
        auto errors = statuses;
        std::erase(errors, Status::Success);
        for (const std::uint32_t status : statuses) {
            driver_.Script(endpoint, {.code = status, .after = 1});
        }
        driver_.Script(endpoint, {.code = Bad});
        ASSERT_TRUE(stream.AllocateBuffers(8, 1));
        ASSERT_TRUE(most == 3 ? stream.StartThread() : stream.StartThread(most));
        EXPECT_TRUE(stream.WaitForExit());
        EXPECT_EQ(stream.Errors(), errors);
        EXPECT_TRUE(stream.ShutdownThread());
        driver_.DropScript(endpoint);
    };
    for (const auto& [name, statuses, most] :
         std::vector<std::tuple<const char*, std::vector<std::uint32_t>, std::uint32_t>>{
             {"at once", {Bad, Bad, Bad}, 2},
             {"a good one starts anew", {Bad, Bad, 0, Bad, Bad, Bad}, 2},
             {"powered down does not count", {Down, Down, Down, Down, Bad, Bad, Bad}, 2},
             {"three are not too many", {Bad, Bad, Bad, 0, Bad, Bad, Bad, Bad}, 3}}) {
        SCOPED_TRACE(name);
        Reader reader;
        run(reader, BulkInEndpoint, statuses, most);
        Writer writer;
        writer.writesWanted = 100;
        run(writer, BulkOutEndpoint, statuses, most);
    }
}

TEST_F(CUsbIoThreadTest, AReadStartedBehindTheAbortDoesNotHoldUpTheEnd) {
    const Platform::OwnedHandle started(Platform::MakeAutoResetEvent());
    const Platform::OwnedHandle aborted(Platform::MakeAutoResetEvent());
    driver_.Script(BulkInEndpoint, {.after = Never, .onStart = [&] {
                                        Platform::SignalEvent(started.Get());
                                        Platform::Wait(aborted.Get(), Limit);
                                        Platform::SleepMilliseconds(20);
                                    }});
    driver_.Script(Control::AbortPipe, {.onStart = [&] { Platform::SignalEvent(aborted.Get()); }});
    Start(2);
    ASSERT_EQ(Platform::Wait(started.Get(), Limit), Platform::WaitResult::Signalled);
    ExpectEnd(2);
}

TEST_F(CUsbIoThreadTest, TheThreadItselfCanAskForItsEnd) {
    driver_.Script(BulkInEndpoint, {.data = {1}, .after = 1});
    bool answer = true;
    reader_.onCompleted = [&] { answer = reader_.ShutdownThread(); };
    Start(1);
    EXPECT_TRUE(reader_.WaitForExit());
    EXPECT_FALSE(answer);
    ExpectEnd(1);
}

TEST_F(CUsbIoThreadTest, SomethingThrownEndsTheThread) {
    driver_.Script(BulkInEndpoint, {.data = {1}, .after = 1});
    reader_.onCompleted = [] { throw 7; };
    Start(3);
    WaitUntil([&] { return !reader_.Received().empty() && driver_.Running(BulkInEndpoint) == 0; });
    ExpectEnd(3);
}

TEST_F(CUsbIoThreadTest, WritesUntilFinished) {
    const Lines all{"write 3 01", "write 3 02", "write 3 03", "write 3 04"};
    for (const std::uint8_t count : {std::uint8_t{4}, std::uint8_t{0}}) {
        Writer writer;
        Bind(writer, BulkOutEndpoint);
        for (int i = 0; i < count; ++i) {
            driver_.Script(BulkOutEndpoint, {.after = 2});
        }
        writer.writesWanted = count;
        ASSERT_TRUE(writer.AllocateBuffers(2, 3));
        ASSERT_TRUE(writer.StartThread());
        EXPECT_TRUE(writer.WaitForExit());
        EXPECT_EQ(driver_.TakeTranscript(), Lines(all.begin(), all.begin() + count));
        EXPECT_TRUE(writer.ShutdownThread());
        EXPECT_EQ(writer.completed, 0);
        EXPECT_EQ(driver_.Running(BulkOutEndpoint), 0U);
    }
}

TEST(CUsbIoBufferPool, HandsOutTheBufferPutBackLast) {
    CUsbIoBufferPool pool;
    EXPECT_FALSE(pool.Allocate(0xFFFFFFFF, 0xFFFFFFFF)) << "more than there can be";
    ASSERT_TRUE(pool.Allocate(16, 2));
    EXPECT_FALSE(pool.Allocate(16, 2)) << "is in use";
    CUsbIoBuffer *const first = pool.Get(), *const second = pool.Get();
    ASSERT_TRUE(first && second);
    EXPECT_EQ(pool.Get(), nullptr);
    EXPECT_EQ(static_cast<std::uint8_t*>(first->Buffer), static_cast<std::uint8_t*>(second->Buffer) + 16)
        << "one block of memory; the buffer behind all others comes first";
    EXPECT_EQ(first->Size, 16U);
    pool.Put(first);
    pool.Put(second);
    EXPECT_EQ(pool.CurrentCount(), 2U);
    EXPECT_EQ(pool.Get(), second);
    pool.Free();
    EXPECT_EQ(pool.Get(), nullptr);
    EXPECT_EQ(pool.CurrentCount(), 0U);
    EXPECT_TRUE(pool.Allocate(1, 1));
}

TEST(CUsbIoThreadRace, AThreadThatEndedByItselfCanBeStartedAgain) {
    for (std::uint64_t seed = 1; seed <= Tests::TestClock::SeedsToTry; ++seed) {
        const Tests::TestClock clock(Tests::TestTime::RealForThreadSanitizer, seed);
        Reader reader;  // without buffers there is nothing to read
        ASSERT_TRUE(reader.StartThread());
        ASSERT_TRUE(reader.WaitForExit());
        Platform::SleepMilliseconds(50);  // the thread lets go of its handle behind that
        ASSERT_TRUE(reader.StartThread()) << seed;
        ASSERT_TRUE(reader.ShutdownThread());
    }
}

}  // namespace
}  // namespace Varnholt::UsbIo
