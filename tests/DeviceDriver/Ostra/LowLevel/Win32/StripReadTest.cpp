#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "Platform/Time.h"
#include "Support/DriverTest.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using namespace DeviceDriver::Ostra::LowLevel;

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

class NativeStripRead : public DriverTest {
  protected:
    NativeStripRead() : DriverTest(TestTime::Virtual) {
        ObserveBeeps([this](std::uint32_t hertz, std::uint32_t milliseconds) {
            beeps_.push_back(std::to_string(hertz) + "/" + std::to_string(milliseconds));
        });
        WaitUntil([this] { return driver_.Running() == 1; });
        driver_.TakeTranscript();
    }
    ~NativeStripRead() override { ObserveBeeps({}); }

    /// "10 50 x": the sizes asked for, and the cancellations.
    std::string TakeReads() {
        std::string reads;
        for (const std::string& line : driver_.TakeTransfers()) {
            const std::size_t size = line.find('[');
            reads += reads.empty() ? "" : " ";
            reads += line == "cancel 1" ? "x" : line.substr(size + 1, line.size() - size - 2);
        }
        return reads;
    }

    Lines beeps_;
    PellandoUSBDevice device_{nullptr, "native/1"};
};

// What a read brings: so many bytes, which count on from read to read, so many milliseconds after its start.

Answer Data(std::size_t bytes, std::uint32_t milliseconds = 0) {
    return {.data = Bytes(bytes), .after = milliseconds};
}
const Answer Stuck{.after = Never, .cancelledAfter = 5};
const Answer Slow{.data = Bytes(50), .after = Never, .cancelledAfter = 30, .cancelledWithData = true};
const Answer TooLong{.data = Bytes(50), .count = 60};
const Answer GoneAtOnce{.code = Errors::DeviceNotConnected}, Refused{.refusal = Errors::DeviceNotConnected};

struct StripCase {
    const char* name;
    std::uint32_t recordSize;
    std::uint32_t total;  ///< 0: uncounted
    std::vector<Answer> brought;
    std::string reads;      ///< the sizes asked for, and "x" for a cancellation
    std::size_t bytesKept;  ///< of those brought
    std::string text = "";  ///< of the exception
    std::uint64_t milliseconds = 0;
};

const std::string Failed = "Read data failed (OverlappedRead)";
const std::string WrongSize = "Read data failed (wrong data size)";
const std::string TooLarge = "Max packages size is 65535";
const std::string Empty = "Record size must not be 0";

std::string Busy(const std::string& what, int read, int expected, int remaining) {
    return "system busy. try again. Read data failed (" + what + " - read: " + std::to_string(read) +
           ", expected: " + std::to_string(expected) + ", remaining: " + std::to_string(remaining) + ")";
}
std::string BusyFailed(int read, int expected, int remaining) {
    return Busy("OverlappedRead", read, expected, remaining);
}

const StripCase StripCases[] = {
    {"ends with an empty first transfer", 5, 0, {Data(0)}, "10 50 50 x", 0},
    // The buffers go with the operation: a read that was still running would write into freed memory.
    {"ends with the reads that it cancels", 5, 0, {Data(5), Slow, Slow}, "10 50 50 x", 5, "", 30},
    {"fails when the first is late", 5, 0, {}, "10 50 x", 0, Failed, Limit},
    {"keeps the records before a failure", 5, 0, {Data(10)}, "10 50 50 x", 10, Failed, Limit},
    {"fails with a transfer", 5, 0, {Data(10), GoneAtOnce}, "10 50 50 x", 10, Failed},
    {"fails with one that does not start", 5, 0, {Data(10), Refused}, "10 50 50 x", 10, Failed},
    {"refuses broken records", 5, 0, {Data(10), Data(49)}, "10 50 50 x", 10, WrongSize},
    {"refuses more than was asked", 5, 0, {Data(10), TooLong}, "10 50 50 x", 10, WrongSize},
    {"largest record", 6553, 0, {Data(6553)}, "13106 65530 65530 x", 6553},
    {"too large a record", 6554, 0, {}, "", 0, TooLarge},
    {"empty records", 0, 0, {}, "", 0, Empty},

    {"counted", 5, 120, {Data(50), Data(50), Data(20)}, "50 50 20", 120},
    {"counted, not whole records", 5, 23, {Data(23)}, "23", 20},
    // The completions of the two outstanding reads share one signal. Whatever their order, no read may be
    // waited for longer than it runs, nor be given up before its time.
    {"counted, the second first", 5, 100, {Data(50, 500), Data(50, 20)}, "50 50", 100, "", 500},
    {"counted, in the last moment", 5, 100, {Data(50, 3999), Data(50, 3998)}, "50 50", 100, "", 3999},
    {"counted, 2nd alone", 5, 100, {Stuck, Data(50, 3000)}, "50 50 x", 0, BusyFailed(0, 50, 0), Limit + 5},
    {"counted, late", 5, 120, {Data(50)}, "50 50 20 x", 50, BusyFailed(0, 50, 0), Limit},
    {"counted, not started", 5, 170, {Refused}, "50 50 x", 0, BusyFailed(0, 50, 70)},
    {"counted, half way", 5, 50, {{.data = Bytes(7), .code = 31}}, "50", 0, BusyFailed(7, 50, 0)},
    {"counted, short", 5, 120, {Data(50), Data(45)}, "50 50 20 x", 50, Busy("wrong data size", 45, 50, 0)},
};

TEST_F(NativeStripRead, SizesAndEndings) {
    for (const StripCase& row : StripCases) {
        SCOPED_TRACE(row.name);
        if (row.milliseconds > Limit - 2 && row.text.empty() && !clock_.IsVirtual()) {
            continue;  // the last moment is a millisecond
        }
        Bytes sent;
        for (Answer answer : row.brought) {
            answer.data = Counting(answer.data.size(), static_cast<unsigned>(sent.size()));
            sent.insert(sent.end(), answer.data.begin(), answer.data.end());
            driver_.Script(ReadPipe, std::move(answer));
        }
        sent.resize(row.bytesKept);
        ScanRecordList records;
        const Stopwatch watch(clock_);
        const auto read = [&] {
            if (row.total != 0) {
                device_.ReadDataCountedStrip(records, row.recordSize, Timeout, row.total);
            } else {
                device_.ReadDataStrip(records, row.recordSize, Timeout);
            }
        };
        row.text.empty() ? read() : ExpectThrow<IOException>(row.text, read);
        watch.Expect(row.milliseconds);
        EXPECT_EQ(Content(records, row.recordSize), sent);
        EXPECT_EQ(TakeReads(), row.reads);
        const bool beeps = row.total == 0 && !row.reads.empty();
        EXPECT_EQ(std::exchange(beeps_, {}), beeps ? Lines{"2140/75"} : Lines());
        EXPECT_EQ(driver_.Running(ReadPipe), 0u);
    }
}

TEST_F(NativeStripRead, LooksAtTheResultWhateverEndsTheWait) {
    const std::vector<std::tuple<std::uint32_t, const char*>> cases{
        {0, "Read data failed (Abandoned)"},
        {120, "system busy. try again. Read data failed (Abandoned - remaining: 20 total: 120)"}};
    for (const auto& [total, text] : cases) {
        const OwnedHandle abandoned(MakeMutex(""));
        BackgroundThread([&] { Wait(abandoned.Get(), Infinite); }).Join();
        ScanRecordList records;
        driver_.Script(ReadPipe, {.after = Never, .completesThrough = abandoned.Get()});
        ExpectThrow<TimeoutException>(text, [&] {
            total == 0 ? device_.ReadDataStrip(records, 5, Timeout)
                       : device_.ReadDataCountedStrip(records, 5, Timeout, total);
        });
        EXPECT_EQ(driver_.Running(ReadPipe), 0u);
        ReleaseMutex(abandoned.Get());
    }
    EXPECT_THAT(beeps_, IsEmpty());
    // A read that ends while its wait fails has ended.
    InstallCallFilter([this](std::string_view call) {
        const bool fails = call == "Wait" && driver_.Running(ReadPipe) == 1;
        SleepMilliseconds(fails ? 20 : 0);
        return fails ? Errors::InvalidHandle : Errors::Success;
    });
    ScanRecordList records;
    driver_.Script(ReadPipe, {.data = Counting(5), .after = 10});
    device_.ReadDataCountedStrip(records, 5, Timeout, 5);
    InstallCallFilter({});
    device_.ReadDataCountedStrip(records, 5, Timeout, 0);  // of which there is nothing to ask for
    EXPECT_EQ(Content(records, 5), Counting(5));
}

}  // namespace
}  // namespace Varnholt::Tests
