// The system's header first: the other one needs it.
// clang-format off
#include <windows.h>
#include <tlhelp32.h>
// clang-format on

#include "Support/ResourceCount.h"

namespace Varnholt::TestSupport {

ResourceCount ResourceCount::Take() {
    ResourceCount count;
    DWORD handles = 0;
    GetProcessHandleCount(GetCurrentProcess(), &handles);
    count.files = handles;
    const HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPTHREAD, 0);
    THREADENTRY32 entry{};
    entry.dwSize = sizeof entry;
    for (BOOL found = Thread32First(snapshot, &entry); found; found = Thread32Next(snapshot, &entry)) {
        count.threads += entry.th32OwnerProcessID == GetCurrentProcessId() ? 1U : 0U;
    }
    CloseHandle(snapshot);
    return count;
}

}  // namespace Varnholt::TestSupport
