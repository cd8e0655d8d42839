#include <gtest/gtest.h>

#include <new>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Failure.h"
#include "Instrument.h"

namespace Varnholt::Tests {
namespace {

using namespace Cli;
using namespace DeviceDriver::Generic::Utilities;

template <class Exception, class... Fact>
FailureReport DescribeText(const char* text, Fact... fact) {
    return Describe(std::make_exception_ptr(Exception(text, "here", fact...)));
}

TEST(FailureTest, TransfersByTheirCode) {
    struct Case {
        std::uint32_t code;
        ExitCode exitCode;
    };
    for (const Case& row : {
             Case{2, ExitCode::NoInstrument},           // nothing under this name
             Case{5, ExitCode::NotAvailable},           // access denied
             Case{170, ExitCode::NotAvailable},         // busy
             Case{31, ExitCode::InputOutput},           // broken
             Case{996, ExitCode::Timeout},              // still running
             Case{1166, ExitCode::InputOutput},         // not the code of the next row
             Case{1167, ExitCode::NoInstrument},        // gone
             Case{0xE0001021, ExitCode::NotAvailable},  // opened by another process
             Case{0xE000100C, ExitCode::Timeout},       // timed out
             Case{0xE000100A, ExitCode::NoInstrument},  // removed
             Case{0xE0000030, ExitCode::InputOutput},   // halted
         }) {
        // What a text says is for people; it decides nothing.
        const char* const text = "read data failed (Win32 Error (1167) : gone)";
        const FailureReport report = DescribeText<IOException>(text, row.code);
        EXPECT_EQ(report.code, row.exitCode) << row.code;
        EXPECT_NE(report.message.find(text), std::string::npos) << report.message;
        EXPECT_FALSE(report.advice.empty()) << row.code;
        const ExitCode late = row.exitCode == ExitCode::InputOutput ? ExitCode::Timeout : row.exitCode;
        EXPECT_EQ(DescribeText<TimeoutException>(text, row.code).code, late) << row.code;
    }
    EXPECT_EQ(DescribeText<IOException>("gone (Win32 Error (1167) : gone)").code, ExitCode::InputOutput);
}

TEST(FailureTest, DataThatCameShortAreCounted) {
    const FailureReport report = DescribeText<IOException>("read data failed", Shortfall{60, 256});
    EXPECT_EQ(report.code, ExitCode::InputOutput);
    EXPECT_EQ(report.message, "60 of 256 bytes came (read data failed)");
    EXPECT_EQ(DescribeText<IOException>("0 of 8 bytes came", Shortfall{0, 8}).message, "0 of 8 bytes came");
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
