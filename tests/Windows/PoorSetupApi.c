/* A setupapi that lacks one of the functions that the library needs. */
#include <windows.h>

__declspec(dllexport) void* WINAPI
    SetupDiGetClassDevsA(const GUID* class, const char* enumerator, HWND parent, DWORD flags) {
    (void)class, (void)enumerator, (void)parent, (void)flags;
    return NULL;
}

__declspec(dllexport) BOOL WINAPI SetupDiDestroyDeviceInfoList(void* list) {
    (void)list;
    return TRUE;
}

__declspec(dllexport) BOOL WINAPI
    SetupDiEnumDeviceInterfaces(void* list, void* device, const GUID* class, DWORD index, void* record) {
    (void)list, (void)device, (void)class, (void)index, (void)record;
    return FALSE;
}
