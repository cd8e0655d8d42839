// What the doctor says on Windows, where kernel drivers present the instruments.
#include <gmock/gmock.h>

#include "FaultPlan.h"
#include "Platform/CallFilter.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/UsbIoDriver.h"
#include "Service/Win32/Diagnosis.h"
#include "Support/SimulatedHost.h"
#include "Support/TestClock.h"

namespace Varnholt::Tests {
namespace {

using Service::FailureKind;
using Service::Finding;
using Level = Finding::Level;
using Platform::Handle;
using testing::HasSubstr;
namespace Errors = Platform::Errors;
namespace UsbIoDriver = Protocol::UsbIoDriver;

/// Devices that each have one driver, as on Windows; the simulated ones have both.
class OneDriverEach final : public Platform::DeviceFileSystem {
  public:
    Transport drivers = Transport::Native;
    std::uint16_t interfaceVersion = UsbIoDriver::InterfaceVersion;

    std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) override {
        const bool isUsbIo = interfaceClass == UsbIoDriver::InterfaceClass;
        return isUsbIo == (drivers == Transport::UsbIo) ? files_.ListInterfaces(interfaceClass)
                                                        : std::vector<std::string>();
    }
    Handle Open(const std::string& path) override { return files_.Open(path); }
    bool CloseFile(Handle file) override { return files_.CloseFile(file); }
    bool StartRead(Handle file, void* buffer, std::uint32_t length, Platform::Overlapped& record) override {
        return files_.StartRead(file, buffer, length, record);
    }
    bool StartWrite(Handle file, const void* buffer, std::uint32_t length,
                    Platform::Overlapped& record) override {
        return files_.StartWrite(file, buffer, length, record);
    }
    bool StartControl(Handle file, std::uint32_t code, const void* input, std::uint32_t inputSize,
                      void* output, std::uint32_t outputSize, Platform::Overlapped& record) override {
        if (code == UsbIoDriver::Control::GetDriverInfo) {
            driverInfo_ = static_cast<std::uint8_t*>(output);
            informed_ = &record;
        }
        return files_.StartControl(file, code, input, inputSize, output, outputSize, record);
    }
    bool GetResult(Handle file, Platform::Overlapped& record, std::uint32_t& transferred,
                   bool wait) override {
        const bool succeeded = files_.GetResult(file, record, transferred, wait);
        if (succeeded && &record == informed_) {
            Protocol::StoreLittle16(driverInfo_, interfaceVersion);
            informed_ = nullptr;
        }
        return succeeded;
    }
    bool CancelTransfers(Handle file) override { return files_.CancelTransfers(file); }

  private:
    Platform::DeviceFileSystem& files_ = Platform::DeviceFiles();
    std::uint8_t* driverInfo_ = nullptr;
    const Platform::Overlapped* informed_ = nullptr;
};

/// One of the two transports, a machine, and what the last finding says of it.
struct Case {
    const char* name;
    Transport transport;
    Transport drivers;
    int instruments;
    std::vector<Level> levels;
    const char* text;
    const char* fix;
    std::optional<FailureKind> failure;
    std::uint16_t version = UsbIoDriver::InterfaceVersion;
    Platform::ErrorCode enumeration = Errors::Success;
    const char* faults = "";
};

TEST(DriverDoctorTest, NamesTheReasonAndTheFix) {
    constexpr auto native = Transport::Native, usbIo = Transport::UsbIo;
    const std::vector noted{Level::Note, Level::Problem};
    const std::vector good{Level::Note, Level::Good};
    const Case cases[] = {
        {"nothing", native, native, 0, noted, "no device with either driver", "look at its cable",
         FailureKind::NotFound},
        {"own driver", native, native, 1, good, "native/sim-0 answers", "", std::nullopt},
        {"USBIO",
         usbIo,
         usbIo,
         2,
         {Level::Note, Level::Good, Level::Good},
         "usbio/sim-1 answers",
         "",
         std::nullopt},
        {"own driver only", usbIo, native, 1, noted,
         "has the instrument's own driver, which is not used here: ", "install a USBIO driver of interface",
         FailureKind::NotFound},
        {"USBIO only", native, usbIo, 1, noted, "has the USBIO driver, which is not used here: ",
         "install the instrument's own driver", FailureKind::NotFound},
        {"too old", usbIo, usbIo, 1, noted, "of interface version 2.2F", "install a USBIO driver",
         FailureKind::NotFound, 0x022F},
        {"too new", usbIo, usbIo, 1, noted, "of interface version 3.00", "install a USBIO driver",
         FailureKind::NotFound, 0x0300},
        {"the newest", usbIo, usbIo, 1, good, "answers", "", std::nullopt, 0x02FF},
        {"no setupapi",
         usbIo,
         usbIo,
         0,
         {Level::Problem},
         "setupapi.dll, which finds instruments, cannot be",
         "sfc /scannow",
         FailureKind::NotFound,
         UsbIoDriver::InterfaceVersion,
         Errors::ModuleNotFound},
        {"another setupapi",
         native,
         native,
         0,
         {Level::Problem},
         "lacks functions",
         "beside the program",
         FailureKind::NotFound,
         UsbIoDriver::InterfaceVersion,
         Errors::ProcedureNotFound},
        {"silent", native, native, 1, noted, "does not answer: ", "unplug it", FailureKind::Timeout,
         UsbIoDriver::InterfaceVersion, Errors::Success, "control 0:silent"},
    };
    for (const Case& row : cases) {
        SCOPED_TRACE(row.name);
        const TestClock clock(TestTime::Virtual);
        SimulatedHost host(row.transport);
        OneDriverEach files;
        files.drivers = row.drivers;
        files.interfaceVersion = row.version;
        const Platform::ScopedDeviceFiles inForce(files);
        for (int number = 0; number < row.instruments; ++number) {
            const std::string name = "sim-" + std::to_string(number);
            host.Add(name);
            host.Bus().SetFaults(name, Simulator::FaultPlan::Parse(row.faults));
        }
        if (row.enumeration != Errors::Success) {
            Platform::InstallCallFilter([&](std::string_view call) {
                return call == "LoadEnumeration" ? row.enumeration : Errors::Success;
            });
        }
        Service::Observer nobody;
        Service::Interruption none;
        Service::Context context(nobody, none);
        const std::vector<Finding> findings = Service::DiagnoseDrivers(context);
        Platform::InstallCallFilter({});
        std::vector<Level> levels;
        for (const Finding& finding : findings) {
            levels.push_back(finding.level);
        }
        ASSERT_EQ(levels, row.levels);
        const Finding& last = findings.back();
        EXPECT_THAT(last.subject + " " + last.text, HasSubstr(row.text));
        EXPECT_THAT(last.fix, HasSubstr(row.fix));
        EXPECT_EQ(last.fix.empty(), *row.fix == '\0') << last.fix;
        EXPECT_EQ(last.failure, row.failure);
    }
}

}  // namespace
}  // namespace Varnholt::Tests
