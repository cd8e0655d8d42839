#include "Platform/Win32/SetupApi.h"

namespace Varnholt::Platform {

SetupApi::~SetupApi() {
    Unload();
}

const SetupApi::EntryPoints* SetupApi::Load() {
    const std::lock_guard held(lock);
    if (module != nullptr) {
        return &entryPoints;
    }
    module = ::LoadLibraryA("setupapi.dll");
    if (module == nullptr) {
        return nullptr;
    }
    const auto find = [this]<typename Function>(Function*& entryPoint, const char* name) {
        entryPoint = FindEntryPoint<Function>(module, name);
        return entryPoint != nullptr;
    };
    if (find(entryPoints.getClassDevs, "SetupDiGetClassDevsA") &&
        find(entryPoints.destroyDeviceInfoList, "SetupDiDestroyDeviceInfoList") &&
        find(entryPoints.enumDeviceInterfaces, "SetupDiEnumDeviceInterfaces") &&
        find(entryPoints.getDeviceInterfaceDetail, "SetupDiGetDeviceInterfaceDetailA")) {
        return &entryPoints;
    }
    const DWORD code = ::GetLastError();
    Unload();
    ::SetLastError(code);
    return nullptr;
}

void SetupApi::Unload() {
    if (module != nullptr) {
        ::FreeLibrary(module);
    }
    module = nullptr;
    entryPoints = {};
}

}  // namespace Varnholt::Platform
