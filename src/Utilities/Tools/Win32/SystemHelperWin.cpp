#include "Utilities/Tools/Win32/SystemHelperWin.h"

#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::Utilities::Tools {
namespace {

constexpr std::uint32_t PlatformWin32s = 0;
constexpr std::uint32_t Platform9x = 1;
constexpr std::uint32_t PlatformNt = 2;

/// Written before any caller can run, and never again.
const Platform::Is64BitHostQuery hostQuery = Platform::LookUp64BitHostQuery();

const char* NameOf9x(std::uint32_t minor) {
    switch (minor) {
        case 10:
            return "98";
        case 90:
            return "Me";
        default:
            return "95";
    }
}

const char* NameOfNt(std::uint32_t major, std::uint32_t minor) {
    if (major < 5) {
        return "NT";
    }
    switch (minor) {
        case 0:
            return "2000";
        case 1:
            return "XP";
        case 2:
            return "2003";
        default:
            return "?";
    }
}

}  // namespace

bool Is64BitOS() try {
    if (const auto overridden = Platform::Overridden64BitHost()) {
        return *overridden;
    }
    return Is64BitOS(hostQuery);
}
TRACED

bool Is64BitOS(Platform::Is64BitHostQuery isWow64Process) {
    int flag = 0;
    if (isWow64Process) {
        isWow64Process(flag);
    }
    return flag != 0;
}

std::string GetOSName() try {
    const Platform::VersionRecord record = Platform::ReadVersionRecord();
    switch (record.platformId) {
        case PlatformWin32s:
            return "3.1 / Win32s";
        case Platform9x:
            return NameOf9x(record.minor);
        case PlatformNt:
            return NameOfNt(record.major, record.minor);
        default:
            return "Unknown Windows version";
    }
}
TRACED

std::string GetServicePack() try {
    const Platform::VersionRecord record = Platform::ReadVersionRecord();
    return record.servicePack + " (Build " + std::to_string(record.build & 0xFFFF) + ")";
}
TRACED

std::string GetOSVersion() {
    const Platform::VersionRecord record = Platform::ReadVersionRecord();
    return std::to_string(record.major) + "." + std::to_string(record.minor);
}

std::string GetOSDescription() {
    return "Microsoft Windows " + GetOSName() + " " + GetServicePack();
}

}  // namespace Varnholt::Utilities::Tools
