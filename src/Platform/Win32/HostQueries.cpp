#include "Platform/HostQueries.h"

#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

using IsWow64ProcessFunction = BOOL WINAPI(HANDLE, PBOOL);

/// Written by the look-up, before anybody can have its result.
IsWow64ProcessFunction* isWow64Process = nullptr;

bool Ask64BitHost(int& flag) {
    return isWow64Process(::GetCurrentProcess(), &flag) != 0;
}

}  // namespace

VersionRecord ReadSystemVersion() {
    OSVERSIONINFOA record{};
    static_assert(sizeof record == 148);
    record.dwOSVersionInfoSize = sizeof record;
    ::GetVersionExA(&record);
    record.szCSDVersion[sizeof record.szCSDVersion - 1] = '\0';
    return {record.dwPlatformId, record.dwMajorVersion, record.dwMinorVersion, record.dwBuildNumber,
            record.szCSDVersion};
}

Is64BitHostQuery LookUp64BitHostQuery() {
    const HMODULE kernel = ::GetModuleHandleA("kernel32");
    if (kernel == nullptr) {
        return nullptr;
    }
    isWow64Process = FindEntryPoint<IsWow64ProcessFunction>(kernel, "IsWow64Process");
    return isWow64Process ? Ask64BitHost : nullptr;
}

}  // namespace Varnholt::Platform
