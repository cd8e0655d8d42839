#include "Platform/CallFilter.h"
#include "Protocol/UsbIoDriver.h"
#include "UsbIoTest.h"

namespace Varnholt::Tests {
namespace {

using namespace Protocol::UsbIoDriver;
using DeviceDriver::Ostra::LowLevel::Bytes2;
using DeviceDriver::Ostra::LowLevel::PellandoFunctionality_Win64;
using Protocol::BulkInEndpoint;
using testing::ElementsAre;
using testing::ElementsAreArray;

using UsbIoCommands = UsbIoTest;

TEST_F(UsbIoCommands, GiveShortAnswersAsTheyCame) {
    const auto instrument = Open();
    Bytes2 value{};
    driver_.Script(Control::ClassOrVendorInRequest, {.data = {31, 32}, .after = 1});
    instrument->ReadCPLD(value);
    driver_.Script(Control::ClassOrVendorInRequest, {.data = {0x77}, .after = 1});
    instrument->ReadCPLD(value);
    EXPECT_THAT(value, ElementsAre(0x77, 0)) << "zeros, not what an earlier command had";

    Bytes buffer(5, 0xEE);
    driver_.Script(BulkInEndpoint, {.data = {9, 8, 7}, .after = 3});
    instrument->MeasureRequest(buffer.data(), 4, 1);
    EXPECT_THAT(buffer, ElementsAre(9, 8, 7, 0xEE, 0xEE));
}

class UsbIoOpening : public UsbIoTest {
  protected:
    UsbIoOpening() : UsbIoTest({"usbio/1", "usbio/2", "usbio/3"}) {}

    static void ExpectFailure(const std::string& text, std::uint32_t index) {
        ExpectThrow<IOException>(text, [index] { PellandoFunctionality_Win64 instrument(nullptr, index); });
    }
};

TEST_F(UsbIoOpening, ConfiguresTheInstrumentThatWasAskedFor) {
    std::string configuration = " 00 00 01 00 00 00 00 00 00 00 01 00";
    for (int i = 0; i < 31 * 8; ++i) {
        configuration += " 00";
    }
    const std::string ask = "control 8094206C / [12]";
    Lines expected;
    for (const char* const listed :
         {"usbio/1", "usbio/2", "usbio/3", "usbio/1"}) {  // the last one: the search
        expected.insert(expected.end(), {std::string("open ") + listed, ask, std::string("close ") + listed});
    }
    expected.insert(expected.end(),
                    {"open usbio/2", ask, "control 80942028 /", "control 80942024" + configuration + " /",
                     "control 8094203C / [8]", "control 80942040 11 00 00 00 00 00 00 00 /", "open usbio/2",
                     ask, "control 80942078 03 /", "open usbio/2", ask, "control 80942078 82 /",
                     "open usbio/2", ask, "control 80942078 84 /"});
    PellandoFunctionality_Win64 instrument(nullptr, 1);
    EXPECT_THAT(TakeTranscript(), ElementsAreArray(expected));
    EXPECT_EQ(driver_.OpenFiles(), 4U);
    std::string identifier;
    instrument.GetDeviceIdentifier(identifier);
    EXPECT_EQ(identifier, "usbio/2");
}

TEST_F(UsbIoOpening, FailsWithoutTheInstrument) {
    ExpectFailure("No such device connected", 3);
    {
        ScriptedDriver none(Lines{});
        const Platform::ScopedDeviceFiles over(none);
        ExpectFailure("No such device connected", 0);
    }
    // The search stops at the first device that does not open.
    const auto failOpen = [this](int after) {
        for (int i = 0; i < after; ++i) {
            driver_.Script(Control::GetDriverInfo, {.data = {0x30, 0x02}});
        }
        driver_.Script(Control::GetDriverInfo, {.code = 31});
    };
    failOpen(3);
    ExpectFailure("requested device not found", 1);
    failOpen(1);
    ExpectFailure("No such device connected", 1);

    Platform::InstallCallFilter([lists = 0](std::string_view call) mutable {
        return call == "MakeList" && ++lists == 2 ? Platform::Errors::InvalidData : Platform::Errors::Success;
    });
    ExpectFailure("Unable to create device list.", 0);
    Platform::InstallCallFilter({});
}

TEST_F(UsbIoOpening, EachStepOfTheConfigurationCanFail) {
    struct Case {
        const char* operation;
        std::uint32_t code;
        int before;
    };
    const Case cases[] = {
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
            driver_.Script(row.code, {});
        }
        driver_.Script(row.code, {.code = Status::AlreadyConfigured});
        ExpectFailure(std::string("Error in UsbIo function: \"") + row.operation +
                          "\" Error: Error code 0xE0001005: USB device is already configured.",
                      0);
        EXPECT_EQ(driver_.OpenFiles(), 0U) << row.operation;
    }
    Platform::InstallCallFilter([](std::string_view call) {
        return call == "StartThread" ? Platform::Errors::NoSystemResources : 0;
    });
    ExpectFailure("could not create interrupt listener thread", 0);
    Platform::InstallCallFilter({});
}

}  // namespace
}  // namespace Varnholt::Tests
