#pragma once

#include <mutex>

#include "Platform/DeviceInterfaces.h"
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

    /// False, with the reason in `LastError`, when the library or one of its entry points cannot be had.
    bool Load();
    /// The present interfaces of a class; null, with the reason in `LastError`, on failure.
    DeviceList MakeList(const Protocol::Guid& interfaceClass);

  private:
    void Unload();

    std::mutex lock_;
    HMODULE module_ = nullptr;   // guarded by lock
    EntryPoints entryPoints_{};  // written under lock, before `Load` says so
};

/// The process's own.
SetupApi& SystemSetupApi();

}  // namespace Varnholt::Platform
