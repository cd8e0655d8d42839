#include <gtest/gtest.h>

#include <new>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Service/Failure.h"
#include "Service/Instruments.h"
#include "Utilities/Files/FileError.h"

namespace Varnholt::Tests {
namespace {

using namespace Service;
using namespace DeviceDriver::Generic::Utilities;

template <class Exception, class... Fact>
Failure DescribeText(const char* text, Fact... fact) {
    return Describe(std::make_exception_ptr(Exception(text, "here", fact...)));
}

TEST(FailureTest, TransfersByTheirCode) {
    for (const auto& [code, kind] : std::vector<std::pair<std::uint32_t, FailureKind>>{
             {2, FailureKind::Unplugged},                // nothing under this name
             {5, FailureKind::NoPermission},             // access denied
             {170, FailureKind::InUse},                  // busy
             {31, FailureKind::TransferFailed},          // broken
             {996, FailureKind::Timeout},                // still running
             {1166, FailureKind::TransferFailed},        // not the code of the next row
             {1167, FailureKind::Unplugged},             // gone
             {0xE0001020, FailureKind::InUse},           // acquired exclusively
             {0xE0001021, FailureKind::InUse},           // opened by another process
             {0xE0006000, FailureKind::Timeout},         // on the bus
             {0xE000100C, FailureKind::Timeout},         // timed out
             {0xE000100A, FailureKind::Unplugged},       // removed
             {0xE0000030, FailureKind::TransferFailed},  // halted
         }) {
        // What a text says is for people; it decides nothing.
        const char* const text = "read data failed (Win32 Error (1167) : gone)";
        const Failure report = DescribeText<IOException>(text, code);
        EXPECT_EQ(report.Kind(), kind) << code;
        EXPECT_NE(report.Message().find(text), std::string::npos) << report.Message();
        EXPECT_FALSE(report.Advice().empty()) << code;
        const FailureKind late = kind == FailureKind::TransferFailed ? FailureKind::Timeout : kind;
        EXPECT_EQ(DescribeText<TimeoutException>(text, code).Kind(), late) << code;
    }
    EXPECT_EQ(DescribeText<IOException>("gone (Win32 Error (1167) : gone)").Kind(),
              FailureKind::TransferFailed);
}

TEST(FailureTest, OtherClasses) {
    const Failure report = DescribeText<IOException>("read data failed", Shortfall{60, 256});
    EXPECT_EQ(report.Kind(), FailureKind::ShortData);
    EXPECT_EQ(report.Message(), "60 of 256 bytes came (read data failed)");
    EXPECT_EQ(DescribeText<IOException>("0 of 8 bytes came", Shortfall{0, 8}).Message(), "0 of 8 bytes came");
    EXPECT_EQ(DescribeText<TimeoutException>("x").Kind(), FailureKind::Timeout);
    EXPECT_EQ(DescribeText<DataException>("x").Kind(), FailureKind::BadData);
    EXPECT_EQ(DescribeText<DataException>("a\r\nb").Message(), "ab")
        << "a system's text ends with a line break";
    EXPECT_EQ(DescribeText<Varnholt::Utilities::Exceptions::ResourceException>("x").Kind(),
              FailureKind::Other);
    EXPECT_EQ(DescribeText<Varnholt::Utilities::Exceptions::InvalidArgumentException>("x").Message(), "x");
    EXPECT_EQ(Describe(std::make_exception_ptr(std::bad_alloc())).Message(), "not enough memory");
    EXPECT_EQ(Describe(std::make_exception_ptr(7)).Kind(), FailureKind::Other);
    const Failure ofFile =
        Describe(std::make_exception_ptr(Varnholt::Utilities::Files::FileError("what", "way out")));
    EXPECT_EQ(ofFile.Kind(), FailureKind::File);
    EXPECT_EQ(ofFile.Advice(), "way out");

    const Failure failure = Failure(FailureKind::Timeout, "late", "wait", "driver's text").Of("usbio/a");
    EXPECT_STREQ(failure.what(), "usbio/a: late");
    const Failure changed =
        Describe(std::make_exception_ptr(failure.Saying("too late").Advising("wait longer")));
    EXPECT_STREQ(changed.what(), "usbio/a: too late");
    EXPECT_EQ(changed.Message(), "too late");
    EXPECT_EQ(changed.Advice(), "wait longer");
    EXPECT_EQ(changed.Kind(), FailureKind::Timeout);
    EXPECT_EQ(changed.Instrument(), "usbio/a");
    EXPECT_EQ(changed.DriverText(), "driver's text");
}

TEST(InstrumentNamesTest, ShortNames) {
    EXPECT_EQ(ShortNameOf("usbio/simulated-a"), "simulated-a");
    EXPECT_EQ(ShortNameOf("native/usb-1p1p2"), "usb-1p1p2");
    EXPECT_EQ(ShortNameOf(R"(\\?\usb#vid_1209&pid_0001#SIM0001#{00873fdf-61a8-11d1-aa5e-00c04fb1728b})"),
              "SIM0001");
    EXPECT_EQ(ShortNameOf(R"(\\?\odd)"), R"(\\?\odd)");
    EXPECT_EQ(ShortNameOf(R"(\\?\usb##{class})"), "");
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
        EXPECT_THROW(FindInstrument(connected, name), Failure) << name;
    }
    EXPECT_THROW(FindInstrument({"a/xy", "b/xy"}, "y"), Failure) << "several fit";
    EXPECT_THROW(FindInstrument({}, ""), Failure);
}

}  // namespace
}  // namespace Varnholt::Tests
