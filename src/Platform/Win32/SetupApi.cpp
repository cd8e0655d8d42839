#include "Platform/Win32/SetupApi.h"

namespace Varnholt::Platform {
namespace {
SetupApi systemSetupApi;
}

SetupApi& SystemSetupApi() {
    return systemSetupApi;
}

SetupApi::~SetupApi() {
    Unload();
}

const SetupApi::EntryPoints* SetupApi::Load() {
    const std::lock_guard held(lock_);
    if (module_ != nullptr) {
        return &entryPoints_;
    }
    module_ = ::LoadLibraryA("setupapi.dll");
    if (module_ == nullptr) {
        return nullptr;
    }
    const auto find = [this]<typename Function>(Function*& entryPoint, const char* name) {
        entryPoint = FindEntryPoint<Function>(module_, name);
        return entryPoint != nullptr;
    };
    if (find(entryPoints_.getClassDevs, "SetupDiGetClassDevsA") &&
        find(entryPoints_.destroyDeviceInfoList, "SetupDiDestroyDeviceInfoList") &&
        find(entryPoints_.enumDeviceInterfaces, "SetupDiEnumDeviceInterfaces") &&
        find(entryPoints_.getDeviceInterfaceDetail, "SetupDiGetDeviceInterfaceDetailA")) {
        return &entryPoints_;
    }
    const DWORD code = ::GetLastError();
    Unload();
    ::SetLastError(code);
    return nullptr;
}

void SetupApi::Unload() {
    if (module_ != nullptr) {
        ::FreeLibrary(module_);
    }
    module_ = nullptr;
    entryPoints_ = {};
}

}  // namespace Varnholt::Platform
