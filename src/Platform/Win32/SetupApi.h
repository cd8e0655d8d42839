#pragma once

#include <mutex>

#include "Platform/Win32/Windows.h"
//
#include <setupapi.h>

namespace Varnholt::Platform {

/// The library that enumerates device interfaces, which hosts older than it lack: loaded at first use,
/// unloaded with the object. Any thread.
class SetupApi final {
  public:
    struct EntryPoints {
        decltype(SetupDiGetClassDevsA)* getClassDevs;
        decltype(SetupDiDestroyDeviceInfoList)* destroyDeviceInfoList;
        decltype(SetupDiEnumDeviceInterfaces)* enumDeviceInterfaces;
        decltype(SetupDiGetDeviceInterfaceDetailA)* getDeviceInterfaceDetail;
    };

    SetupApi() = default;
    ~SetupApi();
    SetupApi(const SetupApi&) = delete;
    SetupApi& operator=(const SetupApi&) = delete;

    /// Null, with the reason in `LastError`, when the library or one of its entry points cannot be had.
    const EntryPoints* Load();

  private:
    void Unload();

    std::mutex lock_;
    HMODULE module_ = nullptr;   // guarded by lock
    EntryPoints entryPoints_{};  // written under lock, before a caller has its address
};

/// The process's own.
SetupApi& SystemSetupApi();

}  // namespace Varnholt::Platform
