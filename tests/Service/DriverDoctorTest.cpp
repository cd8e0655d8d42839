// What the doctor says on Windows, where kernel drivers present the instruments.
#include "ExpectFindings.h"
#include "Platform/HostQueries.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/UsbIoDriver.h"
#include "Support/FailCalls.h"
#include "Support/ScriptedDriver.h"
#include "Support/TestClock.h"

namespace Varnholt::Tests {
namespace {

using Service::FailureKind;
namespace Errors = Platform::Errors;

/// The devices, each with one driver, and what the last finding says of them.
struct Case {
    const char* name;
    bool is64Bit;
    std::vector<std::string> devices;
    std::string levels;
    const char* text;
    const char* fix = "";
    std::optional<FailureKind> failure{};
    std::uint16_t version = 0x0230;
    Platform::ErrorCode enumeration = Errors::Success;
    bool isSilent = false;
};

TEST(DriverDoctorTest, NamesTheReasonAndTheFix) {
    constexpr auto NotFound = FailureKind::NotFound;
    const std::vector<std::string> native{"native/a"}, usbIo{"usbio/a"}, none;
    for (const Case& row : {
             Case{"nothing", false, none, "np", "no device with either driver", "look at its cable",
                  NotFound},
             {"own driver", false, native, "ng", "native/a answers (firmware 258)"},
             {"USBIO", true, {"usbio/a", "usbio/b"}, "ngg", "usbio/b answers", "", {}, 0x02FF},
             {"own driver only", true, native, "np",
              "own driver, which is not used here: on 64-bit Windows the USBIO driver is used\n",
              "install a USBIO driver of interface", NotFound},
             {"USBIO only", false, usbIo, "np",
              "USBIO driver, which is not used here: on 32-bit Windows the instrument's own driver is used\n",
              "install the instrument's own driver", NotFound},
             {"too old", true, usbIo, "np", "of interface version 2.2F", "install a USBIO driver", NotFound,
              0x022F},
             {"too new", true, usbIo, "np", "of interface version 3.00", "install a USBIO driver", NotFound,
              0x0300},
             {"no setupapi", true, none, "p", "setupapi.dll, which finds instruments, cannot be",
              "sfc /scannow", NotFound, 0, Errors::ModuleNotFound},
             {"another setupapi", false, none, "p", "lacks functions", "beside the program", NotFound, 0,
              Errors::ProcedureNotFound},
             {"silent", false, native, "np", "does not answer: ", "unplug it", FailureKind::Timeout, 0,
              Errors::Success, true},
         }) {
        SCOPED_TRACE(row.name);
        const TestClock clock(TestTime::Virtual);
        ScriptedDriver driver(row.devices);
        Service::InterruptibleDeviceFiles files(driver);
        const Platform::ScopedDeviceFiles inForce(files);
        Platform::Override64BitHost(row.is64Bit);
        Bytes information(12);
        Protocol::StoreLittle16(&information[0], row.version);
        for (int opening = 0; opening < 10; ++opening) {
            driver.Script(Protocol::UsbIoDriver::Control::GetDriverInfo, {.data = information, .after = 1});
        }
        driver.Script(0, {.after = row.isSilent ? Never : 0U});
        driver.Script(0, {.data = Counting(8, 1)});
        FailCalls("LoadEnumeration", row.enumeration);
        Service::Observer nobody;
        Service::Interruption never;
        Service::Context context(nobody, never, files);
        ExpectFindings(Service::DiagnoseDrivers(context), row.levels, row.text, row.fix, row.failure);
        EXPECT_EQ(driver.OpenFiles(), 0U);
        Platform::InstallCallFilter({});
        Platform::Override64BitHost(std::nullopt);
    }
}

}  // namespace
}  // namespace Varnholt::Tests
