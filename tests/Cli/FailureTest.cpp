#include <gtest/gtest.h>

#include <new>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Failure.h"
#include "Instrument.h"

namespace Varnholt::Tests {
namespace {

using namespace Cli;
using namespace DeviceDriver::Generic::Utilities;

template <class Exception>
FailureReport DescribeText(const char* text) {
    return Describe(std::make_exception_ptr(Exception(text, "here")));
}

TEST(FailureTest, TransfersBySystemCode) {
    struct Case {
        const char* text;
        ExitCode code;
    };
    for (const Case& row : {
             Case{"No devices connected", ExitCode::NoInstrument},
             Case{"No such device connected", ExitCode::NoInstrument},
             Case{"requested device not found", ExitCode::NoInstrument},
             Case{"could not open pipe: (Win32 Error (2) : no such file)", ExitCode::NoInstrument},
             Case{"could not open pipe: (Win32 Error (5) : denied)", ExitCode::NotAvailable},
             Case{"could not open pipe: (Win32 Error (170) : busy)", ExitCode::NotAvailable},
             Case{"read data failed (Win32 Error (31) : broken)", ExitCode::InputOutput},
             Case{"read data failed (Win32 Error (996) : incomplete)", ExitCode::Timeout},
             Case{"read data failed (Win32 Error (1167) : gone)", ExitCode::NoInstrument},
             Case{"read data failed (Win32 Error (1166) : 31)", ExitCode::InputOutput},
             Case{"Error in UsbIo function: \"SetConfiguration\" Error: Error code 0xE0001021: A different "
                  "process has opened the device.",
                  ExitCode::NotAvailable},
             Case{"Error in UsbIo function: \"ReadSync\" Error: Error code 0xE000100C: timed out",
                  ExitCode::Timeout},
             Case{"Error in UsbIo function: \"ReadSync\" Error: Error code 0xE000100A: removed",
                  ExitCode::NoInstrument},
             Case{"Error in UsbIo function: \"ReadSync\" Error: Error code 0xE0000030: halted",
                  ExitCode::InputOutput},
             Case{"read data failed (Not enough data)", ExitCode::InputOutput},
         }) {
        const FailureReport report = DescribeText<IOException>(row.text);
        EXPECT_EQ(report.code, row.code) << row.text;
        EXPECT_NE(report.message.find(row.text), std::string::npos) << report.message;
        EXPECT_FALSE(report.advice.empty()) << row.text;
    }
}

TEST(FailureTest, OtherClasses) {
    EXPECT_EQ(DescribeText<TimeoutException>("x").code, ExitCode::Timeout);
    EXPECT_EQ(DescribeText<DataException>("corrupt EAT detected!!").code, ExitCode::BadData);
    EXPECT_EQ(DescribeText<Varnholt::Utilities::Exceptions::ResourceException>("x").code, ExitCode::Other);
    EXPECT_EQ(Describe(std::make_exception_ptr(std::bad_alloc())).message, "not enough memory");
    EXPECT_EQ(Describe(std::make_exception_ptr(7)).code, ExitCode::Other);
    const FailureReport own =
        Describe(std::make_exception_ptr(ToolFailure(ExitCode::File, "what", "way out")));
    EXPECT_EQ(own.code, ExitCode::File);
    EXPECT_EQ(own.message, "what");
    EXPECT_EQ(own.advice, "way out");
}

TEST(FailureTest, ASystemTextLosesItsLineBreak) {
    EXPECT_EQ(DescribeText<DataException>("a\r\nb").message, "ab");
}

TEST(InstrumentNamesTest, ShortNames) {
    EXPECT_EQ(ShortNameOf("usbio/simulated-a"), "simulated-a");
    EXPECT_EQ(ShortNameOf("native/usb-1p1p2"), "usb-1p1p2");
    EXPECT_EQ(ShortNameOf(R"(\\?\usb#vid_1209&pid_0001#SIM0001#{00873fdf-61a8-11d1-aa5e-00c04fb1728b})"),
              "SIM0001");
    EXPECT_EQ(ShortNameOf(R"(\\?\odd)"), R"(\\?\odd)");
    EXPECT_EQ(ShortNameOf(""), "");
}

TEST(InstrumentNamesTest, FindsByIdentifierShortNameOrUniqueEnd) {
    const std::vector<std::string> connected{"usbio/1", "usbio/x-1", "usbio/x-21", "usbio/unique"};
    EXPECT_EQ(FindInstrument(connected, ""), 0u);
    EXPECT_EQ(FindInstrument(connected, "usbio/x-1"), 1u);
    EXPECT_EQ(FindInstrument(connected, "1"), 0u) << "a short name goes before ends of others";
    EXPECT_EQ(FindInstrument(connected, "x-21"), 2u);
    EXPECT_EQ(FindInstrument(connected, "que"), 3u);
    EXPECT_EQ(FindInstrument({"a#NAME1#{class}", R"(\\?\u#v#NAME2#{class})"}, "ME2"), 1u);
    for (const char* name : {"-1x", "USBIO/1", "usbio/"}) {
        EXPECT_THROW(FindInstrument(connected, name), ToolFailure) << name;
    }
    EXPECT_THROW(FindInstrument({"a/xy", "b/xy"}, "y"), ToolFailure) << "several fit";
    EXPECT_THROW(FindInstrument({}, ""), ToolFailure);
}

}  // namespace
}  // namespace Varnholt::Tests
