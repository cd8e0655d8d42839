#include <functional>

#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "NativeTest.h"
#include "Platform/Time.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Ostra::LowLevel::PellandoUSBDevice;
using DeviceDriver::Ostra::LowLevel::ScanRecordList;
using testing::ElementsAre;
using testing::IsEmpty;
using Lines = std::vector<std::string>;

constexpr std::uint32_t ReadPipe = 1;
constexpr std::uint32_t Timeout = 1000;
constexpr std::uint32_t Limit = Timeout + 3000;

/// The bytes of all records one after the other; checks that each has the record size.
Bytes Content(const ScanRecordList& records, std::uint32_t recordSize) {
    Bytes content;
    for (const auto& record : records) {
        EXPECT_EQ(record.Bytes().size(), recordSize);
        content.insert(content.end(), record.Bytes().begin(), record.Bytes().end());
    }
    return content;
}

class NativeStripRead : public NativeTest {
  protected:
    void SetUp() override {
        ObserveBeeps([this](std::uint32_t hertz, std::uint32_t milliseconds) {
            beeps.push_back(std::to_string(hertz) + "/" + std::to_string(milliseconds));
        });
        WaitUntil([this] { return IsListening(); });
        driver.TakeTranscript();
    }
    void TearDown() override { ObserveBeeps({}); }

    /// "10 50 x": the sizes asked for, and the cancellations.
    std::string TakeReads() {
        std::string reads;
        for (const std::string& line : driver.TakeTransfers()) {
            const std::size_t size = line.find('[');
            reads += reads.empty() ? "" : " ";
            reads += line == "cancel 1" ? "x" : line.substr(size + 1, line.size() - size - 2);
        }
        return reads;
    }

    Lines beeps;
    PellandoUSBDevice device{nullptr, "native/1"};
};

/// What a read brings: bytes that count up from `first`, `after` milliseconds.
Answer Data(std::size_t count, unsigned first = 1, std::uint32_t after = 0) {
    return {.data = Counting(count, first), .after = after};
}
Answer Failure(ErrorCode code, std::size_t count = 0) {
    return {.data = Counting(count, 1), .code = code};
}

struct StripCase {
    const char* name;
    std::uint32_t recordSize;
    std::uint32_t total;  ///< 0: uncounted
    std::vector<Answer> answers;
    std::string reads;      ///< the sizes asked for, and "x" for a cancellation
    std::size_t bytesKept;  ///< of the answers' data, one after the other
    std::string text = "";  ///< of the exception
    std::uint64_t milliseconds = 0;
};

const std::string Failed = "Read data failed (OverlappedRead)";
const std::string WrongSize = "Read data failed (wrong data size)";
const std::string TooLarge = "Max packages size is 65535";
const std::string Empty = "Record size must not be 0";
const std::string CountedFailed = "system busy. try again. Read data failed (OverlappedRead - ";
const std::string CountedWrongSize = "system busy. try again. Read data failed (wrong data size - ";

const StripCase StripCases[] = {
    {"ends with a short first transfer", 5, 0, {Data(5)}, "10 50 50 x", 5},
    {"ends with an empty first transfer", 5, 0, {Data(0)}, "10 50 50 x", 0},
    {"goes on after two records", 5, 0, {Data(10), Data(45, 11)}, "10 50 50 50 x", 55},
    {"goes on after full chunks",
     5,
     0,
     {Data(10), Data(50, 11), Data(50, 61), Data(0)},
     "10 50 50 50 50 50 x",
     110},
    {"gives each transfer its time",
     5,
     0,
     {Data(10, 1, 3999), Data(50, 11, 7998), Data(5, 61, 7998)},
     "10 50 50 50 50 x",
     65,
     "",
     11997},
    {"fails when the first is late", 5, 0, {}, "10 50 x", 0, Failed, Limit},
    {"keeps the records before a failure", 5, 0, {Data(10)}, "10 50 50 x", 10, Failed, Limit},
    {"fails with a transfer",
     5,
     0,
     {Data(10), Failure(Errors::DeviceNotConnected)},
     "10 50 50 x",
     10,
     Failed},
    {"fails with one that does not start",
     5,
     0,
     {Data(10), {.refusal = Errors::DeviceNotConnected}},
     "10 50 x",
     10,
     Failed},
    {"refuses broken records", 5, 0, {Data(10), Data(49, 11)}, "10 50 50 x", 10, WrongSize},
    {"refuses a broken first record", 5, 0, {Data(4)}, "10 50 x", 0, WrongSize},
    {"largest record", 6553, 0, {Data(6553)}, "13106 65530 65530 x", 6553},
    {"too large a record", 6554, 0, {}, "", 0, TooLarge},
    {"record size that wraps", 0x1999999A, 0, {}, "", 0, TooLarge},
    {"empty records", 0, 0, {}, "", 0, Empty},

    {"counted", 5, 120, {Data(50), Data(50, 51), Data(20, 101)}, "50 50 20", 120},
    {"counted, one chunk", 5, 50, {Data(50)}, "50", 50},
    {"counted, not whole records", 5, 23, {Data(23)}, "23", 20},
    {"counted, less than a record", 5, 3, {Data(3)}, "3", 0},
    {"counted, gives each transfer its time",
     5,
     100,
     {Data(50, 1, 3999), Data(50, 51, 7998)},
     "50 50",
     100,
     "",
     7998},
    {"counted, late",
     5,
     120,
     {Data(50)},
     "50 50 20 x",
     50,
     CountedFailed + "read: 0, expected: 50, remaining: 0)",
     Limit},
    {"counted, failed",
     5,
     170,
     {Failure(Errors::GeneralFailure)},
     "50 50 x",
     0,
     CountedFailed + "read: 0, expected: 50, remaining: 70)"},
    {"counted, failed half way",
     5,
     50,
     {Failure(Errors::GeneralFailure, 7)},
     "50",
     0,
     CountedFailed + "read: 7, expected: 50, remaining: 0)"},
    {"counted, short",
     5,
     120,
     {Data(50), Data(45, 51)},
     "50 50 20 x",
     50,
     CountedWrongSize + "read: 45, expected: 50, remaining: 0)"},
    {"counted, too large a record", 6554, 10, {}, "", 0, TooLarge},
    {"counted, empty records", 0, 10, {}, "", 0, Empty},
};

TEST_F(NativeStripRead, SizesAndEndings) {
    for (const StripCase& row : StripCases) {
        SCOPED_TRACE(row.name);
        if (row.milliseconds > Limit && !clock.IsVirtual()) {
            continue;  // the last moment is a millisecond
        }
        Bytes sent;
        for (const Answer& answer : row.answers) {
            driver.Script(ReadPipe, answer);
            sent.insert(sent.end(), answer.data.begin(), answer.data.end());
        }
        sent.resize(row.bytesKept);
        ScanRecordList records;
        const Stopwatch watch(clock);
        const auto read = [&] {
            if (row.total != 0) {
                device.ReadDataCountedStrip(records, row.recordSize, Timeout, row.total);
            } else {
                device.ReadDataStrip(records, row.recordSize, Timeout);
            }
        };
        if (row.text.empty()) {
            EXPECT_NO_THROW(read());
        } else {
            ExpectThrow<IOException>(row.text, read);
        }
        watch.Expect(row.milliseconds);
        EXPECT_EQ(Content(records, row.recordSize), sent);
        EXPECT_EQ(TakeReads(), row.reads);
        EXPECT_EQ(driver.Running(ReadPipe), 0u);
    }
}

TEST_F(NativeStripRead, OfNoBytesReadsNothing) {
    ScanRecordList records;
    device.ReadDataCountedStrip(records, 5, Timeout, 0);
    EXPECT_THAT(records, IsEmpty());
    EXPECT_EQ(TakeReads(), "");
}

TEST_F(NativeStripRead, AppendsToTheList) {
    ScanRecordList records;
    driver.Script(ReadPipe, {.data = Counting(5, 1)});
    device.ReadDataStrip(records, 5, Timeout);
    driver.Script(ReadPipe, {.data = Counting(5, 6)});
    device.ReadDataCountedStrip(records, 5, Timeout, 5);
    EXPECT_EQ(Content(records, 5), Counting(10, 1));
}

TEST_F(NativeStripRead, BeepsOnceWhenUncounted) {
    ScanRecordList records;
    for (const std::size_t size : {10u, 50u, 0u}) {
        driver.Script(ReadPipe, {.data = Counting(size, 1)});
    }
    device.ReadDataStrip(records, 5, Timeout);
    EXPECT_THAT(beeps, ElementsAre("2140/75"));
    driver.Script(ReadPipe, {.data = Counting(50, 1)});
    device.ReadDataCountedStrip(records, 5, Timeout, 50);
    EXPECT_THAT(beeps, ElementsAre("2140/75"));
}

TEST_F(NativeStripRead, ReportsAnAbandonedWait) {
    ScanRecordList records;
    const AbandonedMutex first;
    driver.Script(ReadPipe, {.after = Never, .completesThrough = first.Get()});
    ExpectThrow<TimeoutException>("Read data failed (Abandoned)",
                                  [&] { device.ReadDataStrip(records, 5, Timeout); });
    EXPECT_THAT(beeps, IsEmpty());
    const AbandonedMutex second;
    driver.Script(ReadPipe, {.after = Never, .completesThrough = second.Get()});
    ExpectThrow<TimeoutException>(
        "system busy. try again. Read data failed (Abandoned - remaining: 20 total: 120)",
        [&] { device.ReadDataCountedStrip(records, 5, Timeout, 120); });
    EXPECT_EQ(driver.Running(ReadPipe), 0u);
    ReleaseMutex(first.Get());
    ReleaseMutex(second.Get());
}

/// The completions of the two outstanding reads share one signal. Whatever their order, no read may be waited
/// for longer than it runs, nor be given up before its time.
TEST_F(NativeStripRead, IsNotMisledByTheSharedSignal) {
    const struct {
        const char* name;
        std::uint32_t first, second;
        std::uint64_t milliseconds;
    } cases[] = {{"in order", 10, 20, 20},
                 {"together", 10, 10, 10},
                 {"the second first", 500, 20, 500},
                 {"the second first, the first in the last moment", 3999, 3998, 3999},
                 {"both at once", 0, 0, 0}};
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        if (row.first == Limit - 1 && !clock.IsVirtual()) {
            continue;  // likewise
        }
        ScanRecordList records;
        driver.Script(ReadPipe, {.data = Counting(50, 1), .after = row.first});
        driver.Script(ReadPipe, {.data = Counting(50, 51), .after = row.second});
        const Stopwatch watch(clock);
        device.ReadDataCountedStrip(records, 5, Timeout, 100);
        EXPECT_EQ(Content(records, 5), Counting(100, 1));
        watch.Expect(row.milliseconds);
    }
    // Signals of the second read do not prolong the first one's time.
    ScanRecordList records;
    driver.Script(ReadPipe, {.after = Never, .cancelledAfter = 5});
    driver.Script(ReadPipe, {.data = Counting(50, 51), .after = 3000});
    const Stopwatch watch(clock);
    EXPECT_THROW(device.ReadDataCountedStrip(records, 5, Timeout, 100), IOException);
    watch.Expect(Limit + 5);
}

/// The buffers go with the operation: a read that was still running would write into freed memory.
TEST_F(NativeStripRead, WaitsForTheEndOfWhatItCancels) {
    const Answer slow{
        .data = Counting(50, 1), .after = Never, .cancelledAfter = 30, .cancelledWithData = true};
    ScanRecordList records;
    driver.Script(ReadPipe, {.data = Counting(5, 1)});
    driver.Script(ReadPipe, slow);
    driver.Script(ReadPipe, slow);
    const Stopwatch watch(clock);
    device.ReadDataStrip(records, 5, Timeout);
    EXPECT_EQ(Content(records, 5), Counting(5, 1));
    watch.Expect(30u);
    EXPECT_EQ(driver.Running(ReadPipe), 0u);
    // What the ended reads signalled must not be taken for the next one's completion.
    driver.Script(ReadPipe, {.data = Counting(4, 1), .after = 20});
    Bytes buffer(4);
    device.ReadData(buffer.data(), 4, 0);
    EXPECT_EQ(buffer, Counting(4, 1));
}

}  // namespace
}  // namespace Varnholt::Tests
