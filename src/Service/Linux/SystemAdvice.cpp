#include "Service/SystemAdvice.h"

#include <fmt/format.h>

#include <algorithm>
#include <iterator>

#include "Platform/Linux/UserDirectory.h"
#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/UdevBus.h"
#include "Service/Instruments.h"
#include "Service/Linux/DeviceHolder.h"

namespace Varnholt::Service {
namespace {

namespace Errors = Platform::Errors;

struct Reason {
    Platform::ErrorCode code;
    const char* text;
    const char* fix;
};

constexpr const char* Mount =
    "sudo mkdir -p /dev/shm && sudo mount -t tmpfs -o mode=1777 tmpfs /dev/shm; in a container, whoever "
    "starts it";

constexpr Reason Reasons[] = {
    {Errors::FileNotFound, "it does not exist", Mount},
    {Errors::PathNotFound, "it is no directory", Mount},
    {Errors::NotSupported, "its file system makes no unnamed files", Mount},
    {Errors::AccessDenied, "it may not be written",
     "sudo chmod 1777 /dev/shm, or where it is mounted read-only: sudo mount -o remount,rw /dev/shm"},
    {Errors::NoSystemResources, "it is full, or this process has too many open files",
     "delete what is not needed there (`df -h /dev/shm`, `df -i /dev/shm`), or raise `ulimit -n`"},
    {Errors::NotEnoughMemory, "not enough memory", "end programs that need much of it"},
    {Errors::InvalidData, "a program with another version of the library uses it", "end that program"},
    {Errors::Busy, "another program keeps its file locked", "end that program"},
};

}  // namespace

const char* const NoInstrumentAdvice =
    "`ostra doctor` looks for the reason; `ostra-simulator` simulates an instrument";

Failure DescribeMissingLock(Platform::ErrorCode code) {
    const auto* const known = std::ranges::find(Reasons, code, &Reason::code);
    const bool isKnown = known != std::end(Reasons);
    return {FailureKind::NoLock,
            fmt::format("the lock that instruments need cannot be had in {}: {}",
                        Platform::Linux::UserDirectory::SharedMemory,
                        isKnown ? known->text : Platform::ErrorText(code)),
            isKnown ? known->fix : Mount};
}

std::string HolderOf(const std::string& identifier) {
    const std::string name = ShortNameOf(identifier);
    for (const auto& device : Platform::Usb::ListRegisteredDevices()) {
        if (device.name == name) {
            return FindHolder(device.deviceNode);
        }
    }
    for (const auto& simulator : Platform::Usb::ListSimulators()) {
        if (simulator.name == name) {
            return simulator.usedBy;
        }
    }
    return {};
}

}  // namespace Varnholt::Service
