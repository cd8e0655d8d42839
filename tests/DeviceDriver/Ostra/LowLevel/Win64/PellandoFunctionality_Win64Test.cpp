#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <functional>

#include "DeviceDriver/Ostra/LowLevel/Win64/PellandoFunctionality_Win64.h"
#include "DeviceDriver/Ostra/USB/Win64/USBBrowserImpl_Win64.h"
#include "Platform/CallFilter.h"
#include "Protocol/Instrument.h"
#include "UsbIoTransportFixture.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Protocol::UsbIoDriver;
using Generic::Utilities::IOException;
using Protocol::BulkInEndpoint;
using Protocol::BulkOutEndpoint;
using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
using Tests::ScriptedUsbIo;
using Tests::TextOf;
using Tests::UsbIoAnswer;
using Tests::VendorIn;
using Tests::VendorOut;

constexpr std::uint32_t Never = UsbIoAnswer::Never;

using PellandoFunctionality_Win64Test = Tests::UsbIoTransportFixture;

/// The answers of the instrument land in here, byte by byte.
struct Answers {
    Bytes2 a{}, b{}, c{};
    std::uint8_t m1 = 0, m2 = 0, m3 = 0, m4 = 0, m5 = 0, m6 = 0;
    std::array<std::uint8_t, 9> buffer{};
};

TEST_F(PellandoFunctionality_Win64Test, CommandsOnTheWire) {
    struct Case {
        const char* name;
        std::function<void(PellandoFunctionalityByte&)> command;
        std::vector<std::string> expected;
    };
    const std::array<std::uint8_t, 3> image{0xA1, 0xA2, 0xA3};
    const std::vector<std::string> endOfWrite{"write 03 00", "write 03 00"};
    Answers out;
    const std::vector<Case> cases{
        {"SetMeasureParameters",
         [](auto& to) {
             to.SetMeasureParameters({0x01, 0x2C}, {0x03, 0x04}, {0x05, 0x06}, 0x07);
         },
         {VendorOut(0xC1, " 01 2C 03 04 05 06 07 00")}},
        {"SetMeasureMode", [](auto& to) { to.SetMeasureMode(5); }, {VendorOut(0xCF, " 05")}},
        {"WriteCPLD",
         [](auto& to) {
             to.WriteCPLD({1, 2}, {3, 4}, {5, 6});
         },
         {VendorOut(0xC7, " 01 02 03 04 05 06")}},
        {"Reset sends the low byte",
         [](auto& to) {
             to.Reset({0x55, 0x1F});
         },
         {VendorOut(0xCA, " 1F")}},
        {"WriteEEPROM",
         [&](auto& to) {
             to.WriteEEPROM({0, 0, 0x10, 0}, {0, 3}, image.data(), 3);
         },
         {VendorOut(0xC3, " 00 00 10 00 00 03 00 00"), "write 03 A1 A2 A3", "write 03 00", "write 03 00"}},
        {"DownloadEEPROMFirmware",
         [&](auto& to) {
             to.DownloadEEPROMFirmware({1, 2, 3, 4}, {5, 6}, image.data(), 2);
         },
         {VendorOut(0xCB, " 01 02 03 04 05 06 00 00"), "write 03 A1 A2", "write 03 00", "write 03 00"}},
        {"DownloadRAMFirmware",
         [&](auto& to) { to.DownloadRAMFirmware(0x1234, image.data(), 3); },
         {VendorOut(0xA0, " A1 A2 A3", 0x1234)}},
        {"the address of the firmware does not stick",
         [](auto& to) { to.SetMeasureMode(1); },
         {VendorOut(0xCF, " 01")}},
        {"an empty firmware",
         [&](auto& to) { to.DownloadRAMFirmware(0, image.data(), 0); },
         {VendorOut(0xA0)}},
        {"ReadEEPROM",
         [&](auto& to) {
             to.ReadEEPROM({0, 0, 0, 0x40}, {0, 4}, out.buffer.data(), 4);
         },
         {VendorOut(0xC4, " 00 00 00 40 00 04 00 00"), "read 82 [4]"}},
        {"MeasureRequest",
         [&](auto& to) { to.MeasureRequest(out.buffer.data(), 4, 2); },
         {VendorOut(0xC0), "read 82 [4]"}},
        {"GetMeasureParameters",
         [&](auto& to) { to.GetMeasureParameters(out.a, out.b, out.c, out.m4, out.m5); },
         {VendorIn(0xC2, 8)}},
        {"GetMeasureMode",
         [&](auto& to) { to.GetMeasureMode(out.m1, out.m2, out.m3, out.m4, out.m5, out.m6); },
         {VendorIn(0xD1, 6)}},
        {"ReadCPLD", [&](auto& to) { to.ReadCPLD(out.a); }, {VendorIn(0xC8, 2)}},
        {"GetMISC", [&](auto& to) { to.GetMISC(out.m1, out.a, out.m3, out.b, out.c); }, {VendorIn(0xC9, 8)}},
        {"GetChipID", [&](auto& to) { to.GetChipID(out.buffer.data()); }, {VendorIn(0xD2, 8)}},
        {"GetDeviceIdentifier",
         [](auto& to) {
             std::string path;
             to.GetDeviceIdentifier(path);
             EXPECT_EQ(path, "usbio/1");
         },
         {}},
    };
    const auto instrument = Open();
    for (const Case& row : cases) {
        driver.Script(BulkInEndpoint, {.data = {1, 2, 3, 4}});
        const Tests::Stopwatch stopwatch(clock);
        row.command(*instrument);
        EXPECT_THAT(TakeTransfers(), ElementsAreArray(row.expected)) << row.name;
        if (!row.expected.empty()) {
            stopwatch.ExpectBetween(1, 2);  // the pause before a request
        }
    }
}

TEST_F(PellandoFunctionality_Win64Test, AnswersGoWhereTheyBelong) {
    const auto instrument = Open();
    const auto answer = [this](std::vector<std::uint8_t> data) {
        driver.ScriptControl(Control::ClassOrVendorInRequest, {.data = std::move(data), .after = 1});
    };
    Answers out;
    answer({1, 2, 3, 4, 5, 6, 7, 8});
    instrument->GetMeasureParameters(out.a, out.b, out.c, out.m4, out.m5);
    EXPECT_EQ(out.a, (Bytes2{1, 2}));
    EXPECT_EQ(out.b, (Bytes2{3, 4}));
    EXPECT_EQ(out.c, (Bytes2{5, 6}));
    EXPECT_EQ(out.m4, 7);
    EXPECT_EQ(out.m5, 8);

    answer({11, 12, 13, 14, 15, 16});
    instrument->GetMeasureMode(out.m1, out.m2, out.m3, out.m4, out.m5, out.m6);
    EXPECT_EQ((std::array{out.m1, out.m2, out.m3, out.m4, out.m5, out.m6}),
              (std::array<std::uint8_t, 6>{11, 12, 13, 14, 15, 16}));

    answer({21, 22, 23, 24, 25, 26, 27, 28});
    instrument->GetMISC(out.m1, out.a, out.m3, out.b, out.c);
    EXPECT_EQ(out.a, (Bytes2{21, 22}));
    EXPECT_EQ(out.b, (Bytes2{23, 24}));
    EXPECT_EQ(out.c, (Bytes2{25, 26}));
    EXPECT_EQ(out.m1, 27);
    EXPECT_EQ(out.m3, 28);

    answer({31, 32});
    instrument->ReadCPLD(out.a);
    EXPECT_EQ(out.a, (Bytes2{31, 32}));

    answer({1, 2, 3, 4, 5, 6, 7, 8});
    out.buffer.fill(0xEE);
    instrument->GetChipID(out.buffer.data());
    EXPECT_THAT(out.buffer, ElementsAre(1, 2, 3, 4, 5, 6, 7, 8, 0xEE));

    answer({0x77});  // a short answer leaves zeros, not what an earlier command had
    instrument->ReadCPLD(out.a);
    EXPECT_EQ(out.a, (Bytes2{0x77, 0}));

    driver.Script(BulkInEndpoint, {.data = {9, 8, 7}, .after = 3});
    out.buffer.fill(0xEE);
    instrument->MeasureRequest(out.buffer.data(), 4, 1);
    EXPECT_THAT(out.buffer, ElementsAre(9, 8, 7, 0xEE, 0xEE, 0xEE, 0xEE, 0xEE, 0xEE));
}

TEST_F(PellandoFunctionality_Win64Test, ReadsWaitTheirTimeAnd5SecondsMore) {
    struct Case {
        const char* name;
        std::function<void(PellandoFunctionalityByte&, std::uint8_t*)> command;
        std::uint32_t limit;
    };
    const std::vector<Case> cases{
        {"2 seconds", [](auto& to, auto* buffer) { to.MeasureRequest(buffer, 64, 2); }, 7000},
        {"64 bytes", [](auto& to, auto* buffer) { to.ReadEEPROM({}, {}, buffer, 64); }, 5064},
    };
    const auto instrument = Open();
    for (const Case& row : cases) {
        std::array<std::uint8_t, 64> buffer;
        const Tests::Stopwatch stopwatch(clock);
        EXPECT_EQ(TextOf<IOException>([&] { row.command(*instrument, buffer.data()); }),
                  "Error in UsbIo function: \"ReadSync\" Error: Error code 0xE000100C: The request has been "
                  "timed out.");
        SCOPED_TRACE(row.name);
        stopwatch.Expect(row.limit + 1);  // and the pause before a request
        EXPECT_EQ(driver.Running(BulkInEndpoint), 0U);
    }
}

TEST_F(PellandoFunctionality_Win64Test, AHugeTimeoutDoesNotWrap) {
    const auto instrument = Open();
    driver.Script(BulkInEndpoint, {.data = {1}, .after = 200});
    std::uint8_t byte = 0;
    instrument->MeasureRequest(&byte, 1,
                               4294963);  // * 1000 + 5000 is 32 bits wide and a few milliseconds more
    EXPECT_EQ(byte, 1);
}

TEST_F(PellandoFunctionality_Win64Test, FailedCommandsSayWhichAndWhy) {
    struct Case {
        const char* operation;
        std::function<void()> arrange;
        std::function<void(PellandoFunctionalityByte&)> command;
    };
    std::array<std::uint8_t, 8> buffer{};
    const auto control = [this](std::uint32_t code, std::uint32_t after) {
        driver.ScriptControl(code, {.code = Status::EndpointHalted, .after = after});
    };
    const std::vector<Case> cases{
        {"ClassOrVendorOutRequest", [&] { control(Control::ClassOrVendorOutRequest, 0); },
         [](auto& to) { to.SetMeasureMode(1); }},
        {"ClassOrVendorOutRequest", [&] { control(Control::ClassOrVendorOutRequest, 3); },
         [&](auto& to) { to.MeasureRequest(buffer.data(), 8, 1); }},
        {"ClassOrVendorOutRequest", [&] { control(Control::ClassOrVendorOutRequest, 3); },
         [](auto& to) { to.StartScan(256, 1, 256); }},
        {"ClassOrVendorInRequest", [&] { control(Control::ClassOrVendorInRequest, 3); },
         [&](auto& to) { to.GetChipID(buffer.data()); }},
        {"ReadSync", [&] { driver.Script(BulkInEndpoint, {.code = Status::EndpointHalted, .after = 3}); },
         [&](auto& to) { to.ReadEEPROM({}, {}, buffer.data(), 8); }},
        {"WriteSync", [&] { driver.Script(BulkOutEndpoint, {.code = Status::EndpointHalted}); },
         [&](auto& to) { to.WriteEEPROM({}, {}, buffer.data(), 8); }},
    };
    const auto instrument = Open();
    for (const Case& row : cases) {
        row.arrange();
        EXPECT_EQ(TextOf<IOException>([&] { row.command(*instrument); }),
                  std::string("Error in UsbIo function: \"") + row.operation +
                      "\" Error: Error code 0xE0000030: USBD Error: Endpoint halted.");
        const std::vector<std::string> sent = TakeTransfers();
        EXPECT_EQ(sent.size(), row.operation[0] == 'C' ? 1U : 2U) << "nothing follows a failure";
    }
}

class UsbIoOpeningTest : public Tests::UsbIoTransportFixture {
  protected:
    UsbIoOpeningTest() { Platform::Override64BitHost(true); }
    ~UsbIoOpeningTest() override { EXPECT_EQ(three.OpenFiles(), 0U); }

    static std::string OpeningFails(std::uint32_t index) {
        return TextOf<IOException>([index] { PellandoFunctionality_Win64 instrument(nullptr, index); });
    }

    ScriptedUsbIo three{{"usbio/1", "usbio/2", "usbio/3"}};
    Platform::ScopedDeviceFiles files{three};
};

TEST_F(UsbIoOpeningTest, ConfiguresTheInstrumentThatWasAskedFor) {
    std::string configuration = " 00 00 01 00 00 00 00 00 00 00 01 00";
    for (int i = 0; i < 31 * 8; ++i) {
        configuration += " 00";
    }
    const std::string ask = "control 8094206C / [12]";
    std::vector<std::string> expected;
    for (const char* const listed :
         {"usbio/1", "usbio/2", "usbio/3", "usbio/1"}) {  // the last one: the search
        expected.insert(expected.end(), {std::string("open ") + listed, ask, std::string("close ") + listed});
    }
    expected.insert(expected.end(),
                    {"open usbio/2", ask, "control 80942028 /", "control 80942024" + configuration + " /",
                     "control 8094203C / [8]", "control 80942040 11 00 00 00 00 00 00 00 /", "open usbio/2",
                     ask, "control 80942078 03 /", "open usbio/2", ask, "control 80942078 82 /",
                     "open usbio/2", ask, "control 80942078 84 /"});
    const PellandoFunctionality_Win64 instrument(nullptr, 1);
    std::vector<std::string> transcript = three.TakeTranscript();
    std::erase_if(transcript, [](const std::string& line) { return line.rfind("read 84", 0) == 0; });
    EXPECT_THAT(transcript, ElementsAreArray(expected));
    EXPECT_EQ(three.OpenFiles(), 4U);
}

TEST_F(UsbIoOpeningTest, FailsWithoutTheInstrument) {
    EXPECT_EQ(OpeningFails(3), "No such device connected");
    {
        ScriptedUsbIo none{{}};
        const Platform::ScopedDeviceFiles over(none);
        EXPECT_EQ(OpeningFails(0), "No such device connected");
    }
    // The search stops at the first device that does not open.
    const auto failOpen = [this](int after) {
        for (int i = 0; i < after; ++i) {
            three.ScriptControl(Control::GetDriverInfo, {.data = {0x30, 0x02}});
        }
        three.ScriptControl(Control::GetDriverInfo, {.code = 31});
    };
    failOpen(3);
    EXPECT_EQ(OpeningFails(1), "requested device not found");
    failOpen(1);
    EXPECT_EQ(OpeningFails(1), "No such device connected");
}

TEST_F(UsbIoOpeningTest, EachStepOfTheConfigurationCanFail) {
    struct Case {
        const char* operation;
        std::uint32_t code;
        int before;
    };
    const std::vector<Case> cases{
        {"UnconfigureDevice", Control::UnconfigureDevice, 0},
        {"SetConfiguration", Control::SetConfiguration, 0},
        {"GetDeviceParameters", Control::GetDeviceParameters, 0},
        {"SetDeviceParameters", Control::SetDeviceParameters, 0},
        {"BindTX", Control::BindPipe, 0},
        {"BindRX", Control::BindPipe, 1},
        {"BindIR", Control::BindPipe, 2},
    };
    for (const Case& row : cases) {
        for (int i = 0; i < row.before; ++i) {
            three.ScriptControl(row.code, {});
        }
        three.ScriptControl(row.code, {.code = Status::AlreadyConfigured});
        EXPECT_EQ(OpeningFails(0), std::string("Error in UsbIo function: \"") + row.operation +
                                       "\" Error: Error code 0xE0001005: USB device is already configured.");
        EXPECT_EQ(three.OpenFiles(), 0U) << row.operation;
    }
}

TEST_F(UsbIoOpeningTest, FailsWithoutTheListenersThread) {
    Platform::InstallCallFilter([](std::string_view call) {
        return call == "StartThread" ? Platform::Errors::NoSystemResources : 0;
    });
    EXPECT_EQ(OpeningFails(0), "could not create interrupt listener thread");
    Platform::InstallCallFilter({});
}

TEST_F(UsbIoOpeningTest, TheBrowserListsWhatOpens) {
    USB::USBBrowserImpl_Win64 browser;
    for (const std::int32_t selector : {0, 1}) {
        EXPECT_THAT(browser.GetDevices(selector), ElementsAre("usbio/1", "usbio/2", "usbio/3"));
    }
    EXPECT_TRUE(browser.IsAnyOstraConnected());
    three.RefuseOpen("usbio/2", Platform::Errors::AccessDenied);
    EXPECT_THAT(browser.GetDevices(0), ElementsAre("usbio/1"));
    three.RefuseOpen("usbio/1", Platform::Errors::AccessDenied);
    EXPECT_FALSE(browser.IsAnyOstraConnected());
}

TEST(USBBrowserImpl_Win64, ListsNoMoreThan127) {
    ScriptedUsbIo many{std::vector<std::string>(130, "usbio/x")};
    const Platform::ScopedDeviceFiles files(many);
    EXPECT_EQ(USB::USBBrowserImpl_Win64().GetDevices(0).size(), 127U);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
