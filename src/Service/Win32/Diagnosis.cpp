#include <fmt/format.h>

#include <algorithm>
#include <optional>

#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "Platform/DeviceFiles.h"
#include "Platform/DeviceInterfaces.h"
#include "Platform/OverlappedRequest.h"
#include "Platform/WaitableObjects.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"
#include "Service/Finding.h"
#include "Service/Instruments.h"
#include "Service/SystemAdvice.h"
#include "UsbIo/UsbIoRecords.h"

namespace Varnholt::Service {
namespace {

using Level = Finding::Level;
using Platform::ErrorCode;
namespace Driver = Protocol::UsbIoDriver;

struct DriverFacts {
    const char* name;
    const char* whatToInstall;
    const Protocol::Guid& interfaceClass;
};
constexpr DriverFacts OwnDriver{"the instrument's own driver", "the instrument's own driver",
                                Protocol::NativeDriver::InterfaceClass};
constexpr DriverFacts UsbIoDriver{"the USBIO driver", "a USBIO driver of interface version 2.30 to 2.FF",
                                  Driver::InterfaceClass};
/// Milliseconds. Longer than a transfer in good order keeps the lock, and shorter than a user's patience.
constexpr std::uint32_t LongestWaitForLock = 8000;

std::vector<std::string> PathsOf(const DriverFacts& driver) {
    return Platform::DeviceFiles().ListInterfaces(driver.interfaceClass);
}

std::string WhyThisDriver(const Context& context, bool usesUsbIo) {
    const DriverFacts& driver = usesUsbIo ? UsbIoDriver : OwnDriver;
    return context.IsTransportChosen()
               ? fmt::format("--transport asks for {}", driver.name)
               : fmt::format("on {}-bit Windows {} is used", usesUsbIo ? "64" : "32", driver.name);
}

Finding DescribeMissingEnumeration(ErrorCode code) {
    const bool isIncomplete = code == Platform::Errors::ProcedureNotFound;
    return {Level::Problem, "",
            fmt::format("setupapi.dll, which finds instruments, {} (Windows error {})",
                        isIncomplete ? "lacks functions" : "cannot be loaded", code),
            isIncomplete ? "remove the file of that name beside the program: Windows has its own"
                         : "it is a part of Windows: `sfc /scannow` brings it back",
            FailureKind::NotFound};
}

/// What the driver tells of itself to who only opens the device; a code where it tells nothing.
struct DriverAnswer {
    ErrorCode failure = Platform::Errors::Success;
    std::uint16_t version = 0;
};

DriverAnswer AskUsbIo(const std::string& path) {
    Platform::DeviceFileSystem& files = Platform::DeviceFiles();
    const Platform::Handle file = files.Open(path);
    if (file == Platform::InvalidHandle()) {
        return {.failure = Platform::LastError()};
    }
    DriverAnswer answer;
    const Platform::OwnedHandle event(Platform::MakeAutoResetEvent());
    {
        UsbIo::DriverInfo::Bytes bytes{};
        std::uint32_t moved = 0;
        Platform::OverlappedRequest request(event.Get());
        request.Start(file, Platform::Operation::Control(Driver::Control::GetDriverInfo, {}, bytes.data(),
                                                         bytes.size()));
        if (request.GetResult(moved, true)) {
            answer.version = UsbIo::DriverInfo::Decode(bytes).interfaceVersion;
        } else {
            answer.failure = Platform::LastError();
        }
    }
    files.CloseFile(file);
    return answer;
}

/// What keeps the instrument from being opened over USBIO, where the driver itself tells.
std::optional<Finding> LookAtUsbIo(const std::string& path) {
    const DriverAnswer answer = AskUsbIo(path);
    if (answer.failure == Platform::Errors::FileNotFound) {
        return Finding{Level::Problem, path, "is listed but not there any more",
                       "unplug it and plug it in again", FailureKind::NotFound};
    }
    if (answer.failure != Platform::Errors::Success) {
        return Finding{
            Level::Problem, path, fmt::format("cannot be opened (Windows error {})", answer.failure),
            "end other programs that use it, or unplug it and plug it in again", FailureKind::InUse};
    }
    constexpr unsigned firstByte = 0xFF00;
    if (answer.version >= Driver::InterfaceVersion &&
        (answer.version & firstByte) == (Driver::InterfaceVersion & firstByte)) {
        return std::nullopt;
    }
    return Finding{
        Level::Problem, path,
        fmt::format("has a USBIO driver of interface version {:X}.{:02X}, and 2.30 to 2.FF can be used",
                    answer.version >> 8U, answer.version & 0xFFU),
        fmt::format("let the device manager install {} for it", UsbIoDriver.whatToInstall),
        FailureKind::NotFound};
}

/// Over the instrument's own driver a transfer waits for as long as another process keeps the lock.
std::optional<Finding> LookAtLock(const std::string& path) {
    const Platform::OwnedHandle lock(
        Platform::MakeMutex(DeviceDriver::Ostra::LowLevel::PellandoUSBDevice::StripStrangeChars(path)));
    if (!lock) {
        const Failure missing = DescribeMissingLock(Platform::LastError());
        return Finding{Level::Problem, path, missing.Message(), missing.Advice(), missing.Kind()};
    }
    if (Platform::Wait(lock.Get(), LongestWaitForLock) == Platform::WaitResult::TimedOut) {
        return Finding{Level::Problem, path, "is in use by another process, which does not give it back",
                       "end that program, or wait until it is done", FailureKind::InUse};
    }
    Platform::ReleaseMutex(lock.Get());
    return std::nullopt;
}

Finding JudgeInstrument(Context& context, const std::string& path, bool usesUsbIo) {
    if (auto obstacle = usesUsbIo ? LookAtUsbIo(path) : LookAtLock(path)) {
        return *obstacle;
    }
    const std::vector<std::string> connected = ListInstruments(context);
    if (std::ranges::find(connected, path) == connected.end()) {
        return {Level::Problem, path, "is not listed by the library, because one before it cannot be opened",
                "what is to be done for that one, or unplug it", FailureKind::NotFound};
    }
    return JudgeAnswer(path, TryInstrument(context, path));
}

}  // namespace

std::vector<Finding> DiagnoseDrivers(Context& context) {
    const bool usesUsbIo = context.UsedTransport() == Context::Transport::UsbIo;
    const DriverFacts& used = usesUsbIo ? UsbIoDriver : OwnDriver;
    const DriverFacts& other = usesUsbIo ? OwnDriver : UsbIoDriver;
    const bool canList = Platform::DeviceInterfaces::Load();
    const ErrorCode loadFailure = Platform::LastError();
    const std::vector<std::string> instruments = PathsOf(used);
    const std::vector<std::string> others = PathsOf(other);
    std::vector<Finding> findings;
    if (!canList && instruments.empty()) {  // an old Windows has another list
        findings.push_back(DescribeMissingEnumeration(loadFailure));
        return findings;
    }
    findings.push_back(
        {Level::Note, "",
         fmt::format("{}; devices present: {} with it, {} with {}", WhyThisDriver(context, usesUsbIo),
                     instruments.size(), others.size(), other.name),
         ""});
    for (const std::string& path : instruments) {
        findings.push_back(JudgeInstrument(context, path, usesUsbIo));
    }
    for (const std::string& path : others) {
        findings.push_back(
            {Level::Problem, path,
             fmt::format("has {}, which is not used here: {}", other.name, WhyThisDriver(context, usesUsbIo)),
             fmt::format("let the device manager install {} for it", used.whatToInstall),
             FailureKind::NotFound});
    }
    if (instruments.empty() && others.empty()) {
        findings.push_back({Level::Problem, "", "no device with either driver is plugged in",
                            "plug the instrument in and look at its cable and hub; a device that the device "
                            "manager shows with a warning sign needs its driver",
                            FailureKind::NotFound});
    }
    return findings;
}

}  // namespace Varnholt::Service
