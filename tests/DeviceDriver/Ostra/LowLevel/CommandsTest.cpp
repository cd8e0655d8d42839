#include <cstring>
#include <sstream>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoFunctionality_PC.h"
#include "Platform/ScopedThreadPriority.h"
#include "Protocol/Instrument.h"
#include "Protocol/UsbIoDriver.h"
#include "Support/DriverTest.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Generic::MessageButtonData;
using namespace DeviceDriver::Ostra::LowLevel;
using Protocol::UsbIoDriver::Status::EndpointHalted;
using namespace Utilities::Exceptions;
using I = PellandoFunctionality;
using Pointer = Utilities::Tools::SmartPointer<PellandoFunctionalityByte>;

/// What the transport of this driver sends for one command: request and value, the bytes sent or "[room]" for
/// what comes in; bulk transfers behind it, as in "C0@0|in [4]".
Lines OnTheWire(bool isNative, const std::string& wire) {
    std::istringstream text(wire);
    unsigned request = 0, value = 0;
    char at = 0;
    text >> std::hex >> request >> at >> value;
    std::string data, transfer;
    std::getline(text, data, '|');
    const int direction = data.starts_with(" [") ? 1 : 0;
    char line[80];
    std::snprintf(line, sizeof line,
                  isNative
                      ? "control 22000D %02X 02 00 00 %02X 00 %02X %02X 00 00 /"
                      : "control 8094203%X 00 00 00 00 02 00 00 00 00 00 00 00 00 %02X %02X %02X 00 00 /",
                  isNative ? direction : 5 - 3 * direction, request, value & 0xFFU, value >> 8U);
    Lines lines{line + data};
    while (std::getline(text, transfer, '|')) {
        const bool isRead = transfer.starts_with("in");
        lines.push_back(std::string(isRead ? "read " : "write ") +
                        (isNative ? (isRead ? "1" : "2") : (isRead ? "82" : "3")) +
                        transfer.substr(transfer.find(' ')));
    }
    return lines;
}

/// The command set over either driver.
class Commands : public TransportTest {
  protected:
    ~Commands() override {
        Close();
        EXPECT_EQ(driver_.OpenFiles(), 0U);
    }

    static std::uint32_t In() { return IsNative() ? 1U : Protocol::BulkInEndpoint; }
    static std::uint32_t Out() { return IsNative() ? 2U : Protocol::BulkOutEndpoint; }
    static std::uint32_t Interrupts() { return IsNative() ? 3U : Protocol::InterruptInEndpoint; }

    PellandoFunctionality& Open() {
        transport_ = PellandoFunctionalityByte::Instance(&listener_, 0);
        instrument_.emplace(transport_);
        WaitUntil([this] { return driver_.Running(Interrupts()) == 1; });
        driver_.TakeTranscript();
        return *instrument_;
    }
    void Close() {
        instrument_.reset();
        transport_ = Pointer();
    }
    Lines TakeTransfers() { return WithoutListener(driver_.TakeTransfers()); }
    void ExpectOnTheWire(const std::string& wire) { EXPECT_EQ(TakeTransfers(), OnTheWire(IsNative(), wire)); }

    RecordingListener listener_;
    Pointer transport_;
    std::optional<PellandoFunctionality> instrument_;
};
OSTRA_ON_BOTH_TRANSPORTS(Commands);

// What commands hand out.
const Bytes None;
std::uint16_t a, b, c;
Bytes m(8);

Bytes Word(std::uint16_t value) {
    return {static_cast<std::uint8_t>(value >> 8), static_cast<std::uint8_t>(value)};
}
Bytes Parameters(std::uint8_t first, std::uint8_t second) {
    return Join(Word(a), Word(b), Word(c), Bytes{first, second});
}

struct Command {
    const char* name;
    const char* wire;
    std::function<Bytes(I&)> run;  ///< gives what the command handed out, in the order of the wire
};

const Command EachCommand[] = {
    {"SetMeasureParameters", "C1@0 01 2C 03 04 05 06 07 00",
     [](I& i) { return i.SetMeasureParameters(0x012C, 0x0304, 0x0506, 7), None; }},
    {"GetMeasureParameters", "C2@0 [8]",
     [](I& i) { return i.GetMeasureParameters(a, b, c, m[0], m[1]), Parameters(m[0], m[1]); }},
    {"SetMeasureMode", "CF@0 42", [](I& i) { return i.SetMeasureMode(0x42), None; }},
    {"GetMeasureMode", "D1@0 [6]",
     [](I& i) { return i.GetMeasureMode(m[0], m[1], m[2], m[3], m[4], m[5]), Bytes(&m[0], &m[6]); }},
    {"MeasureRequest", "C0@0|in [4]",
     [](I& i) { return i.MeasureRequest(m.data(), 4, 1), Bytes(&m[0], &m[4]); }},
    {"WriteEEPROM", "C3@0 00 01 10 00 00 03 00 00|out 31 32 33|out 00|out 00",
     [](I& i) { return i.WriteEEPROM(0x11000, Counting(3, 0x31)), None; }},
    {"WriteCPLD", "C7@0 01 2C 03 04 05 06", [](I& i) { return i.WriteCPLD(0x012C, 0x0304, 0x0506), None; }},
    {"ReadCPLD", "C8@0 [2]", [](I& i) { return i.ReadCPLD(a), Word(a); }},
    {"DownloadRAMFirmware", "A0@1234 31 32 33",
     [](I& i) { return i.DownloadFirmware(0x1234, Counting(3, 0x31), false), None; }},
    {"DownloadEEPROMFirmware", "CB@0 00 00 12 34 00 03 00 00|out 31 32 33|out 00|out 00",
     [](I& i) { return i.DownloadFirmware(0x1234, Counting(3, 0x31), true), None; }},
    {"GetMISC", "C9@0 [8]", [](I& i) { return i.GetMISC(m[0], a, m[1], b, c), Parameters(m[0], m[1]); }},
    {"Reset", "CA@0 1F", [](I& i) { return i.Reset(0x551F), None; }},
};

TEST_P(Commands, OnTheWire) {
    for (const Command& command : EachCommand) {
        SCOPED_TRACE(command.name);
        Close();  // over one of the drivers a command leaves bytes to the next one
        PellandoFunctionality& instrument = Open();
        a = b = c = 0;
        m.assign(8, 0);
        const char* const room = std::strchr(command.wire, '[');
        const Bytes answer = room ? Counting(std::strtoul(room + 1, nullptr, 10), 0xA1) : Bytes();
        driver_.DropScript(0);
        driver_.Script(std::strstr(command.wire, "|in") ? In() : 0, {.data = answer});
        const Stopwatch watch(clock_);
        EXPECT_EQ(command.run(instrument), answer);
        watch.ExpectBetween(1, 2);  // a request takes a pause of a millisecond
        ExpectOnTheWire(command.wire);
    }
    driver_.DropScript(0);
    driver_.Script(0, {.data = Counting(8, 0xA1)});
    transport_->GetChipID(m.data());
    EXPECT_EQ(m, Counting(8, 0xA1));
    ExpectOnTheWire("D2@0 [8]");
    std::string identifier;
    instrument_->GetDeviceIdentifier(identifier);
    EXPECT_EQ(identifier, Paths(1)[0]);
}

TEST_P(Commands, MoveMemoryInPiecesThatTheWireCanCarry) {
    PellandoFunctionality& instrument = Open();
    const Bytes data = Counting(257);
    instrument.WriteEEPROM(0x1000, data);
    instrument.WriteEEPROM(0, {});
    Lines lines =
        OnTheWire(IsNative(), "C3@0 00 00 10 00 01 00 00 00|out " + Hex(&data[0], 256) + "|out 00|out 00");
    std::ranges::move(OnTheWire(IsNative(), "C3@0 00 00 11 00 00 01 00 00|out 00|out 00|out 00"),
                      std::back_inserter(lines));
    EXPECT_EQ(TakeTransfers(), lines);
    const std::pair<std::size_t, const char*> reads[] = {{1, "C4@0 00 01 10 C0 00 40 00 00|in [64]"},
                                                         {64, "C4@0 00 01 10 C0 00 40 00 00|in [64]"},
                                                         {65, "C4@0 00 01 10 C0 00 80 00 00|in [128]"}};
    for (const auto& [wanted, wire] : reads) {
        Bytes read(wanted);
        driver_.Script(In(), {.data = Counting(wanted <= 64 ? 64 : 128, 7)});
        instrument.ReadEEPROM(0x110C0, read);
        EXPECT_EQ(read, Counting(wanted, 7));
        ExpectOnTheWire(wire);
    }
    Bytes nothing, tooMuch(0x10000);
    for (Bytes* const refused : {&nothing, &tooMuch}) {
        const std::string text = "data of 1 to 65535 bytes expected";
        ExpectThrow<InvalidArgumentException>(text, [&] { instrument.ReadEEPROM(0, *refused); });
        ExpectThrow<InvalidArgumentException>(text, [&] { instrument.DownloadFirmware(0, *refused, true); });
    }
    EXPECT_THAT(TakeTransfers(), IsEmpty());
    EXPECT_NO_THROW(instrument.DownloadFirmware(0, Bytes(0xFFFF), false));
    EXPECT_THROW(PellandoFunctionality{Pointer()}, NullPointerException);
}

TEST_P(Commands, CanBeMadeToRefuseDataThatAreNotWhole) {
    PellandoFunctionality& instrument = Open();
    transport_->RequireWholeData();
    driver_.Script(Out(), {.count = 2});
    ExpectThrow<IOException>(IsNative() ? "write data failed (Not enough data)" : "2 of 3 bytes came",
                             [&] { instrument.WriteEEPROM(0, Bytes(3)); });
}

/// The native driver's record keeps its bytes from one command to the next, and so they are sent.
TEST_P(Commands, SendWhatEarlierCommandsLeftOverTheNativeDriverOnly) {
    const bool isNative = IsNative();
    PellandoFunctionality& instrument = Open();
    std::uint16_t value = 0;
    instrument.Reset(0x771F);
    const std::vector<std::tuple<Bytes, std::uint16_t, std::uint16_t>> answers{
        {{}, 0x1F1F, 0}, {{31, 32}, 0x1F20, 0x1F20}, {{0x77}, 0x7720, 0x7700}};
    for (const auto& [answer, native, usbIo] : answers) {
        driver_.Script(0, {.data = answer});
        instrument.ReadCPLD(value);
        EXPECT_EQ(value, isNative ? native : usbIo);
    }
    driver_.Script(0, {.data = Counting(8, 0xA1)});
    instrument.GetMeasureParameters(a, b, c, m[0], m[1]);
    TakeTransfers();
    instrument.SetMeasureParameters(0, 0, 0, 0);
    ExpectOnTheWire(isNative ? "C1@0 00 00 00 00 00 00 00 A8" : "C1@0 00 00 00 00 00 00 00 00");
    instrument.DownloadFirmware(0x1234, Bytes(1), false);
    TakeTransfers();
    instrument.SetMeasureMode(1);
    ExpectOnTheWire(isNative ? "CF@1234 01" : "CF@0 01");
}

TEST_P(Commands, EndWithTheTransferThatFailsOrTakesTooLong) {
    const ErrorCode stall = IsNative() ? Errors::GeneralFailure : EndpointHalted;
    Bytes buffer(250);
    const auto write = [&](I& i) { i.WriteEEPROM(0, buffer); };
    const auto read = [&](I& i) { i.ReadEEPROM(0, buffer); };
    const auto measure = [&](I& i) { i.MeasureRequest(buffer.data(), 64, 2); };
    const auto scan = [](I& i) { i.StartScan(5, 2, 0); };
    const auto countedScan = [](I& i) { i.StartScan(5, 2, 770); };
    const std::string control = "Device IO control failed: ", scanWait = "WaitForCompletion1";
    constexpr std::uint64_t noEnd = 0;
    // What the transports say of a stall, with the name that USBIO gives the operation.
    const struct {
        std::string native, usbIo;
        std::function<void(I&)> run;
        std::uint32_t place;
        std::size_t answeredBefore = 0;                         ///< transfers of the place
        std::uint64_t nativeLimit = noEnd, usbIoLimit = noEnd;  ///< milliseconds without an answer
    } cases[] = {
        {control, "ClassOrVendorOutRequest", write, 0},
        {control, "ClassOrVendorInRequest", [](I& i) { i.ReadCPLD(a); }, 0},
        {control, "ClassOrVendorOutRequest", measure, 0},
        {control, "ClassOrVendorOutRequest", scan, 0},
        {"read data failed", "ReadSync", measure, In(), 0, 2000 + 5000, 2000 + 5000},
        {"read data failed", "ReadSync", read, In(), 0, 256 + 5000, 256 + 5000},
        {"write data failed", "WriteSync", write, Out(), 0, 2500 + 5000},
        {"write data failed", "WriteSync", write, Out(), 1, 5000},
        {"write data failed", "WriteSync", write, Out(), 2, 5000},
        {"Read data failed (OverlappedRead)", scanWait, scan, In(), 0, 2000 + 3000, 256 * 15 + 5000},
        {"system busy. try again. Read data failed (OverlappedRead - read: 0, expected: 50, remaining: 670)",
         scanWait, countedScan, In(), 0, 2000 + 3000, 3 * 15 + 5000},
    };
    PellandoFunctionality& instrument = Open();
    for (const auto& row : cases) {
        SCOPED_TRACE(testing::Message() << "case " << &row - cases);
        const bool isScan = row.place == In() && row.usbIo == scanWait;
        const auto script = [&](const Answer& last) {
            for (std::size_t i = 0; i < row.answeredBefore; ++i) {
                driver_.Script(row.place, {});
            }
            driver_.Script(row.place, last);
        };
        script({.code = stall, .after = 3});
        ExpectThrow<IOException>(IsNative()
                                     ? row.native + (isScan ? "" : ErrorSuffix(stall))
                                     : "Error in UsbIo function: \"" + row.usbIo +
                                           "\" Error: Error code 0xE0000030: USBD Error: Endpoint halted.",
                                 [&] { row.run(instrument); });
        const std::size_t transfers = TakeTransfers().size();
        EXPECT_TRUE(isScan || transfers == (row.place == 0 ? 1 : row.answeredBefore + 2))
            << "nothing follows a failure";
        EXPECT_EQ(buffer.size(), 250U);
        const std::uint64_t limit = IsNative() ? row.nativeLimit : row.usbIoLimit;
        if (clock_.IsVirtual() && limit != noEnd) {
            script({.after = Never});
            const Stopwatch watch(clock_);
            EXPECT_THROW(row.run(instrument), IOException);
            watch.Expect(1 + limit);
        }
        TakeTransfers();
        EXPECT_EQ(driver_.Running(row.place), 0U);
    }
}

TEST_P(Commands, ScanAtRaisedPriorityAndGiveItBack) {
    PellandoFunctionality& instrument = Open();
    const int before = CurrentThreadPriority();
    const int raised = [] {
        const ScopedThreadPriority highest(HighestThreadPriority);
        return CurrentThreadPriority();  // where the system refuses a level, it stays as it was
    }();
    int during = -99;
    driver_.Script(
        In(), {.data = Counting(5, 1), .after = 1, .onStart = [&] { during = CurrentThreadPriority(); }});
    instrument.StartScan(5, 1, IsNative() ? 5 : 1000);
    EXPECT_EQ(during, raised);
    EXPECT_EQ(TakeTransfers().front(), OnTheWire(IsNative(), "C0@0").front());
    EXPECT_EQ(CurrentThreadPriority(), before);
}

TEST_P(Commands, PassMessagesOnUntilTheListenerIsRemoved) {
    PellandoFunctionality& instrument = Open();
    listener_.onMessage = [&](std::uint32_t) { instrument.removeListener(&listener_); };
    for (const bool isRemoved : {false, true}) {
        SleepMilliseconds(50);  // an interrupt just after the opening is thrown away
        EXPECT_TRUE(driver_.Complete(Interrupts(), Answer{.data = {1}}));
        SleepMilliseconds(50);
        EXPECT_THAT(listener_.Codes(), ElementsAre(MessageButtonData)) << isRemoved;
        EXPECT_NO_THROW(instrument.SetMeasureMode(1)) << "only the end of the instrument closes its pipes";
    }
}

TEST_P(Commands, NameTheInstrumentThatIsNotThere) {
    for (const auto& [count, index] : {std::pair{0U, 0U}, {2U, 2U}, {2U, 0xFFFFFFFFU}}) {
        ScriptedDriver driver(Paths(count));
        const ScopedDeviceFiles files(driver);
        ExpectThrow<IOException>(
            IsNative() && count == 0 ? "No devices connected" : "No such device connected",
            [index = index] { PellandoFunctionality(nullptr, index); });
    }
}

class NativeCommands : public DriverTest {
  protected:
    Bytes NextRecord(std::uint32_t size) {
        Bytes buffer(size);
        instrument_.GetScanData(buffer.data(), size);
        buffer.resize(size);
        return buffer;
    }
    /// A scan of so many bytes, counted from `first` on.
    void Scan(std::size_t bytes, unsigned first) {
        driver_.Script(1, {.data = Counting(bytes, first)});
        instrument_.StartScan(5, 1, static_cast<std::uint32_t>(bytes));
    }
    PellandoFunctionality instrument_{Pointer(new PellandoFunctionality_PC(nullptr, 0))};
};

TEST_F(NativeCommands, HandOutTheRecordsOfAScan) {
    Scan(20, 1);
    EXPECT_EQ(NextRecord(5), Counting(5, 1));
    EXPECT_EQ(NextRecord(3), Counting(3, 6)) << "a smaller buffer takes the record's beginning";
    EXPECT_EQ(NextRecord(8), Counting(5, 11)) << "a larger one gets no more than the record holds";
    Scan(10, 0x71);
    EXPECT_EQ(NextRecord(5), Counting(5, 0x71)) << "a new scan begins with an empty list";
    EXPECT_EQ(NextRecord(5), Counting(5, 0x76));
    EXPECT_THAT(NextRecord(5), IsEmpty());
    driver_.Script(1, {.data = Counting(10, 1)});
    ExpectThrow<IOException>("Read data failed (OverlappedRead)", [&] { instrument_.StartScan(5, 1, 0); });
    EXPECT_THAT(NextRecord(5), IsEmpty()) << "what came before the failure is discarded";
    struct : ScanReceiver {
        void Receive(std::span<const std::uint8_t>) override {}
    } receiver;
    Scan(10, 1);
    instrument_.SetScanReceiver(&receiver);
    Scan(10, 1);
    EXPECT_THAT(NextRecord(5), IsEmpty()) << "neither of this scan nor of the one before";
}

}  // namespace
}  // namespace Varnholt::Tests
