#include <cstring>
#include <sstream>

#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoFunctionality_PC.h"
#include "DeviceDriver/Ostra/LowLevel/Win64/PellandoFunctionality_Win64.h"
#include "Platform/HostQueries.h"
#include "Platform/ScopedThreadPriority.h"
#include "Protocol/Instrument.h"
#include "Support/Transport.h"
#include "Win32/NativeTest.h"

namespace Varnholt::Tests {
namespace {

using namespace Platform;
using DeviceDriver::Ostra::LowLevel::Bytes2;
using DeviceDriver::Ostra::LowLevel::Bytes4;
using DeviceDriver::Ostra::LowLevel::PellandoFunctionality_PC;
using DeviceDriver::Ostra::LowLevel::PellandoFunctionality_Win64;
using Protocol::UsbIoDriver::Status::EndpointHalted;
using I = DeviceDriver::Ostra::LowLevel::PellandoFunctionalityByte;

/// A command as the transports of both drivers carry it.
class Commands : public DriverTest, public testing::WithParamInterface<Transport> {
  protected:
    Commands() { Override64BitHost(!IsNative()); }
    ~Commands() override {
        Override64BitHost(std::nullopt);
        EXPECT_EQ(driver_.OpenFiles(), 0U);
    }

    static bool IsNative() { return GetParam() == Transport::Native; }
    static std::uint32_t In() { return IsNative() ? 1U : Protocol::BulkInEndpoint; }
    static std::uint32_t Out() { return IsNative() ? 2U : Protocol::BulkOutEndpoint; }
    static std::uint32_t Interrupts() { return IsNative() ? 3U : Protocol::InterruptInEndpoint; }

    std::unique_ptr<I> Open() {
        std::unique_ptr<I> opened;
        if (IsNative()) {
            opened = std::make_unique<PellandoFunctionality_PC>(nullptr, 0);
        } else {
            opened = std::make_unique<PellandoFunctionality_Win64>(nullptr, 0);
        }
        WaitUntil([this] { return driver_.Running(Interrupts()) == 1; });
        driver_.TakeTranscript();
        return opened;
    }
    /// Without the interrupt listener's reads.
    Lines TakeTransfers() {
        Lines lines = driver_.TakeTransfers();
        std::erase_if(lines, [](const std::string& line) {
            return line.starts_with("read 84") || line.starts_with("cancel 84");
        });
        return lines;
    }
};
INSTANTIATE_TEST_SUITE_P(Transports, Commands, testing::Values(Transport::Native, Transport::UsbIo),
                         [](const auto& parameter) { return std::string(Name(parameter.param)); });

const Bytes2 P1{0x01, 0x2C}, P2{0x03, 0x04}, P3{0x05, 0x06}, Length{0x01, 0x03}, ResetCode{0x55, 0x1F};
const Bytes4 Address{0x00, 0x00, 0x10, 0x00};
const Bytes Image = Counting(3, 0x31);

// What commands hand out.
const Bytes None;
Bytes2 a, b, c;
Bytes m(8);

Bytes Parameters(std::uint8_t first, std::uint8_t second) {
    return {a[0], a[1], b[0], b[1], c[0], c[1], first, second};
}

struct Command {
    const char* name;
    /// Request and value, the bytes sent or "[room]" for what comes in; bulk transfers behind it: "in [4]".
    const char* wire;
    std::function<Bytes(I&)> run;  ///< gives what the command handed out, in the order of the wire

    Lines Transcript(bool isNative) const {
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
    /// Of the instrument, in the data stage or as bulk data.
    Bytes Answer() const {
        const char* const room = std::strchr(wire, '[');
        return room ? Counting(std::strtoul(room + 1, nullptr, 10), 0xA1) : Bytes();
    }
};

const Command EachCommand[] = {
    {"SetMeasureParameters", "C1@0 01 2C 03 04 05 06 07 00",
     [](I& i) { return i.SetMeasureParameters(P1, P2, P3, 7), None; }},
    {"GetMeasureParameters", "C2@0 [8]",
     [](I& i) { return i.GetMeasureParameters(a, b, c, m[0], m[1]), Parameters(m[0], m[1]); }},
    {"SetMeasureMode", "CF@0 42", [](I& i) { return i.SetMeasureMode(0x42), None; }},
    {"GetMeasureMode", "D1@0 [6]",
     [](I& i) { return i.GetMeasureMode(m[0], m[1], m[2], m[3], m[4], m[5]), Bytes(&m[0], &m[6]); }},
    {"MeasureRequest", "C0@0|in [4]",
     [](I& i) { return i.MeasureRequest(m.data(), 4, 1), Bytes(&m[0], &m[4]); }},
    {"WriteEEPROM", "C3@0 00 00 10 00 01 03 00 00|out 31 32 33|out 00|out 00",
     [](I& i) { return i.WriteEEPROM(Address, Length, Image.data(), 3), None; }},
    {"ReadEEPROM", "C4@0 00 00 10 00 01 03 00 00|in [8]",
     [](I& i) { return i.ReadEEPROM(Address, Length, m.data(), 8), m; }},
    {"WriteCPLD", "C7@0 01 2C 03 04 05 06", [](I& i) { return i.WriteCPLD(P1, P2, P3), None; }},
    {"ReadCPLD", "C8@0 [2]", [](I& i) { return i.ReadCPLD(a), Bytes(a.begin(), a.end()); }},
    {"DownloadRAMFirmware", "A0@1234 31 32 33",
     [](I& i) { return i.DownloadRAMFirmware(0x1234, Image.data(), 3), None; }},
    {"DownloadRAMFirmware of nothing", "A0@0",
     [](I& i) { return i.DownloadRAMFirmware(0, Image.data(), 0), None; }},
    {"DownloadEEPROMFirmware", "CB@0 00 00 10 00 01 03 00 00|out 31 32 33|out 00|out 00",
     [](I& i) { return i.DownloadEEPROMFirmware(Address, Length, Image.data(), 3), None; }},
    {"GetMISC", "C9@0 [8]", [](I& i) { return i.GetMISC(m[0], a, m[1], b, c), Parameters(m[0], m[1]); }},
    {"GetChipID", "D2@0 [8]", [](I& i) { return i.GetChipID(m.data()), m; }},
    {"Reset", "CA@0 1F", [](I& i) { return i.Reset(ResetCode), None; }},
};

TEST_P(Commands, OnTheWire) {
    auto instrument = Open();
    for (const Command& command : EachCommand) {
        SCOPED_TRACE(command.name);
        if (IsNative()) {
            instrument.reset();  // over this driver a command leaves bytes to the next one
            instrument = Open();
        }
        a = b = c = {};
        m.assign(m.size(), 0);
        driver_.DropScript(0);
        driver_.Script(std::strstr(command.wire, "|in") ? In() : 0, {.data = command.Answer()});
        const Stopwatch watch(clock_);
        EXPECT_EQ(command.run(*instrument), command.Answer());
        watch.ExpectBetween(1, 2);  // a request takes a pause of a millisecond
        EXPECT_EQ(TakeTransfers(), command.Transcript(IsNative()));
    }
    driver_.DropScript(0);
}

TEST_P(Commands, EndWithTheTransferThatFails) {
    const ErrorCode stall = IsNative() ? Errors::GeneralFailure : EndpointHalted;
    std::array<std::uint8_t, 64> buffer{};
    const auto write = [&](I& i) { i.WriteEEPROM({}, {}, buffer.data(), 64); };
    const auto read = [&](I& i) { i.ReadEEPROM({}, {}, buffer.data(), 64); };
    const auto update = [&](I& i) { i.DownloadEEPROMFirmware({}, {}, buffer.data(), 64); };
    struct Failure {
        const char* nativeText;
        const char* usbIoName;
    };
    const Failure outward{"Device IO control failed: ", "ClassOrVendorOutRequest"},
        inward{"Device IO control failed: ", "ClassOrVendorInRequest"},
        reading{"read data failed", "ReadSync"}, writing{"write data failed", "WriteSync"};
    const struct {
        const char* name;
        Failure failure;
        std::uint32_t place;
        std::size_t failing;  ///< of the transfers of this place; all behind one control
        std::function<void(I&)> run;
    } cases[] = {
        {"out", outward, 0, 0, [](I& i) { i.SetMeasureMode(1); }},
        {"in", inward, 0, 0, [&](I& i) { i.GetChipID(buffer.data()); }},
        {"measure", outward, 0, 0, [&](I& i) { i.MeasureRequest(buffer.data(), 64, 1); }},
        {"scan", outward, 0, 0, [](I& i) { i.StartScan(5, 1, 0); }},
        {"counted scan", outward, 0, 0, [](I& i) { i.StartScan(5, 1, 100); }},
        {"read", outward, 0, 0, read},
        {"read, data", reading, In(), 0, read},
        {"firmware", outward, 0, 0, update},
        {"write", outward, 0, 0, write},
        {"write, data", writing, Out(), 0, write},
        {"write, first byte behind", writing, Out(), 1, write},
        {"write, second byte behind", writing, Out(), 2, write},
    };
    const auto instrument = Open();
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        for (std::size_t i = 0; i < row.failing; ++i) {
            driver_.Script(row.place, {});
        }
        driver_.Script(row.place, {.code = stall, .after = 3});
        ExpectThrow<IOException>(IsNative()
                                     ? row.failure.nativeText + ErrorSuffix(stall)
                                     : std::string("Error in UsbIo function: \"") + row.failure.usbIoName +
                                           "\" Error: Error code 0xE0000030: USBD Error: Endpoint halted.",
                                 [&] { row.run(*instrument); });
        EXPECT_EQ(TakeTransfers().size(), row.place == 0 ? 1 : row.failing + 2)
            << "nothing follows a failure";
    }
}

TEST_P(Commands, WaitTheirTimeForData) {
    std::array<std::uint8_t, 64> buffer{};
    const auto instrument = Open();
    const auto expectFailureAfter = [&](std::uint64_t milliseconds, const std::function<void()>& command) {
        driver_.TakeTranscript();
        const Stopwatch watch(clock_);
        ExpectThrow<IOException>(
            IsNative()
                ? "read data failed" + ErrorSuffix(Errors::IoIncomplete)
                : "Error in UsbIo function: \"ReadSync\" Error: Error code 0xE000100C: The request has "
                  "been timed out.",
            command);
        watch.Expect(1 + milliseconds);
        EXPECT_EQ(driver_.Running(In()), 0U);
    };
    expectFailureAfter(2000 + 5000, [&] { instrument->MeasureRequest(buffer.data(), 64, 2); });
    expectFailureAfter(64 + 5000, [&] { instrument->ReadEEPROM({}, {}, buffer.data(), 64); });
}

TEST_P(Commands, ScanAtRaisedPriorityAndGiveItBack) {
    const auto instrument = Open();
    const int before = CurrentThreadPriority();
    const int raised = [] {
        const ScopedThreadPriority highest(HighestThreadPriority);
        return CurrentThreadPriority();  // where the system refuses a level, it stays as it was
    }();
    for (const ErrorCode code : {Errors::Success, Errors::GeneralFailure}) {
        int during = -99;
        driver_.Script(In(), {.data = Counting(5, 1), .code = code, .after = 1, .onStart = [&] {
                                  during = CurrentThreadPriority();
                              }});
        try {
            instrument->StartScan(5, 1, IsNative() ? 5 : 1000);
            EXPECT_EQ(code, Errors::Success);
        } catch (const IOException&) {
            EXPECT_NE(code, Errors::Success);
        }
        EXPECT_EQ(during, raised);
        EXPECT_EQ(CurrentThreadPriority(), before);
    }
}

}  // namespace
}  // namespace Varnholt::Tests
