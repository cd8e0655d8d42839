#include "Platform/Time.h"
#include "Protocol/UsbIoDriver.h"
#include "UsbIoTest.h"

namespace Varnholt::Tests {
namespace {

using DeviceDriver::Ostra::LowLevel::PellandoFunctionalityByte;
using Protocol::BulkInEndpoint;
using Protocol::UsbIoDriver::Status::EndpointHalted;

constexpr std::uint32_t Whole = 65536;

/// Bytes of a stream, different from one 256-byte record to the next.
Bytes Stream(std::size_t from, std::size_t count) {
    Bytes bytes(count);
    for (std::size_t i = 0; i < count; ++i) {
        const std::size_t place = from + i;
        bytes[i] = static_cast<std::uint8_t>(place * 7 + place / 256 * 13);
    }
    return bytes;
}

class UsbIoScan : public UsbIoTest {
  protected:
    UsbIoScan() {
        Platform::ObserveBeeps([this](std::uint32_t hertz, std::uint32_t milliseconds) {
            {
                const std::lock_guard held(beepLock_);
                beeps_.emplace_back(hertz, milliseconds);
            }
            Platform::SignalEvent(beeped_.Get());
        });
    }
    ~UsbIoScan() override { Platform::ObserveBeeps({}); }

    /// The instrument sends the stream in transfers of these sizes, one after the other.
    void Send(const std::vector<std::uint32_t>& sizes, std::uint32_t after) {
        for (const std::uint32_t size : sizes) {
            driver_.Script(BulkInEndpoint, {.data = Stream(sent_, size), .after = after});
            sent_ += size;
        }
    }

    static Bytes TakeAll(PellandoFunctionalityByte& instrument, std::uint32_t piece) {
        Bytes all;
        for (;;) {
            Bytes part(piece);
            std::uint32_t size = piece;
            instrument.GetScanData(part.data(), &size);
            if (size == 0) {
                return all;
            }
            all.insert(all.end(), part.data(), part.data() + size);
        }
    }

    std::size_t sent_ = 0;
    std::mutex beepLock_;
    std::vector<std::pair<std::uint32_t, std::uint32_t>> beeps_;
    Platform::OwnedHandle beeped_{Platform::MakeAutoResetEvent()};
};

std::string Read(std::uint32_t size) {
    return "read 82 [" + std::to_string(size) + "]";
}

TEST_F(UsbIoScan, FixedScans) {
    struct Case {
        const char* name;
        std::uint32_t total;
        std::vector<std::uint32_t> transfers;  ///< what the instrument sends
        std::vector<std::uint32_t> reads;      ///< what it is asked for
        std::uint32_t end;
    };
    const std::vector<Case> cases{
        {"two transfers", 100000, {Whole, 34464, 0}, {Whole, 34464, 0, 0}, 100000},
        {"short", 100000, {Whole, 4464}, {Whole, 34464, 0}, 70000},
        {"short at once", 100000, {10}, {Whole, 34464}, 10},
        {"empty at once", 100000, {0}, {Whole, 34464}, 0},
        {"less than a transfer", 256, {256, 0}, {256, 0, 0}, 256},
        {"one byte", 1, {1, 0}, {1, 0, 0}, 1},
        {"a whole transfer", Whole, {Whole, 0}, {Whole, 0, 0}, Whole},
        {"a byte more", Whole + 1, {Whole, 1, 0}, {Whole, 1, 0, 0}, Whole + 1},
        {"several", 3 * Whole, {Whole, Whole, Whole, 0}, {Whole, Whole, Whole, 0, 0}, 3 * Whole},
    };
    for (const std::uint32_t after : {0U, 1U}) {
        for (const Case& row : cases) {
            const auto instrument = Open();
            sent_ = 0;
            Send(row.transfers, after);
            instrument->StartScan(256, 1, row.total);
            Lines expected{"control 80942035 00 00 00 00 02 00 00 00 00 00 00 00 00 C0 00 00 00 00 /"};
            for (const std::uint32_t size : row.reads) {
                expected.push_back(Read(size));
            }
            expected.emplace_back("cancel 82");
            EXPECT_THAT(TakeTranscript(), testing::ElementsAreArray(expected)) << row.name;
            EXPECT_EQ(TakeAll(*instrument, 256), Stream(0, row.end)) << row.name;
            EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U) << row.name;
        }
    }
    EXPECT_TRUE(beeps_.empty());
}

TEST_F(UsbIoScan, OpenEndedScansGrow) {
    const auto instrument = Open();
    for (const std::uint32_t total : {0U, 256U, Whole, 1280000U, 2000000U}) {
        sent_ = 0;
        Send(std::vector<std::uint32_t>(total / Whole, Whole), 0);
        Send({total % Whole}, 1);
        const Stopwatch stopwatch(clock_);
        instrument->StartScan(256, 1, 0);
        EXPECT_LT(stopwatch.Milliseconds(), 300U) << "a scan does not wait for its beep";
        EXPECT_EQ(TakeAll(*instrument, 100000), Stream(0, total)) << total;
        EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
        // Each scan beeps once, and the beep comes by itself.
        ASSERT_EQ(Platform::Wait(beeped_.Get(), 10000), Platform::WaitResult::Signalled);
        stopwatch.ExpectBetween(370, 372);
        const std::lock_guard held(beepLock_);
        EXPECT_EQ(beeps_, (std::vector<std::pair<std::uint32_t, std::uint32_t>>{{2140, 75}})) << total;
        beeps_.clear();
    }
}

TEST_F(UsbIoScan, AFailureEndsAScanAndLeavesNothing) {
    const auto instrument = Open();
    for (const Answer& answer :
         {Answer{.code = EndpointHalted, .after = 3}, Answer{.refusal = EndpointHalted}}) {
        sent_ = 0;
        Send({Whole}, 1);
        driver_.Script(BulkInEndpoint, answer);
        ExpectThrow<IOException>(
            "Error in UsbIo function: \"WaitForCompletion1\" Error: Error code 0xE0000030: USBD Error: "
            "Endpoint halted.",
            [&] { instrument->StartScan(256, 1, 3 * Whole); });
        EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
        EXPECT_EQ(TakeAll(*instrument, 256), Bytes());
    }
}

TEST_F(UsbIoScan, MoreThanWasAskedForIsRefused) {
    // No driver should report more than a read asked for; where one does, a fixed scan stays within its size.
    const auto instrument = Open();
    const auto scanTooMuch = [&] {
        driver_.Script(BulkInEndpoint, {.data = Bytes(100), .after = 1, .count = 101});
        instrument->StartScan(256, 1, 100);
    };
    ExpectThrow<DataException>("buffer size is fix", scanTooMuch);
    EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
    sent_ = 0;
    Send({5000, 0}, 1);
    instrument->StartScan(256, 1, 5000);
    // Now there would be room for it.
    ExpectThrow<DataException>("more bytes read than expected", scanTooMuch);
    EXPECT_EQ(TakeAll(*instrument, 256), Bytes());
}

}  // namespace
}  // namespace Varnholt::Tests
