#include "Platform/HostQueries.h"

#include <sys/utsname.h>

#include <cstdio>
#include <string_view>

namespace Varnholt::Platform {
namespace {

/// None of the Windows families (0 to 2). An NT-family record with a kernel's version in it would be taken
/// for a Windows that it is not: 6.1 is "XP" there.
constexpr std::uint32_t NoWindows = 3;

/// There is no 32-bit layer to ask about; what counts is the machine that the kernel reports.
bool AskForMachine(int& flag) {
    utsname host{};
    if (uname(&host) != 0) {
        return false;
    }
    const std::string_view machine = host.machine;
    flag = machine.find("64") != std::string_view::npos || machine == "s390x" || machine == "alpha";
    return true;
}

}  // namespace

VersionRecord ReadSystemVersion() {
    VersionRecord record;
    record.platformId = NoWindows;
    utsname host{};
    if (uname(&host) == 0) {
        // A release has the form 6.1.0-13-amd64; what is missing stays 0.
        // NOLINTBEGIN(cert-err34-c): nine digits fit
        static_cast<void>(
            std::sscanf(host.release, "%9u.%9u.%9u", &record.major, &record.minor, &record.build));
        // NOLINTEND(cert-err34-c)
        record.servicePack = std::string(host.sysname) + " " + host.release;
    }
    return record;
}

Is64BitHostQuery LookUp64BitHostQuery() {
    return AskForMachine;
}

}  // namespace Varnholt::Platform
