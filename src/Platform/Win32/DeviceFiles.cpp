#include "Platform/DeviceFiles.h"

#include "Platform/CallFilter.h"
#include "Platform/HostQueries.h"
#include "Platform/Win32/RegistryInterfaces.h"
#include "Platform/Win32/SetupApi.h"
#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

// The records are handed to the system as they are.
static_assert(sizeof(Overlapped) == sizeof(OVERLAPPED));
static_assert(offsetof(Overlapped, internal) == offsetof(OVERLAPPED, Internal));
static_assert(offsetof(Overlapped, internalHigh) == offsetof(OVERLAPPED, InternalHigh));
static_assert(offsetof(Overlapped, offset) == offsetof(OVERLAPPED, Offset));
static_assert(offsetof(Overlapped, offsetHigh) == offsetof(OVERLAPPED, OffsetHigh));
static_assert(offsetof(Overlapped, event) == offsetof(OVERLAPPED, hEvent));

OVERLAPPED* SystemRecord(Overlapped& record) {
    return reinterpret_cast<OVERLAPPED*>(&record);
}

/// NT hosts before version 5 have no device-interface enumeration.
bool HostKeepsInterfacesInRegistry() {
    constexpr std::uint32_t NtFamily = 2;
    const VersionRecord version = ReadVersionRecord();
    return version.platformId == NtFamily && version.major < 5;
}

class WindowsDeviceFiles final : public DeviceFileSystem {
  public:
    bool LoadEnumeration() override { return SystemSetupApi().Load(); }

    DeviceList MakeList(const Protocol::Guid& interfaceClass, bool withRegistryFallback) override {
        if (withRegistryFallback && HostKeepsInterfacesInRegistry()) {
            return std::make_shared<InterfaceList>(interfaceClass, ListRegistryInterfaces(interfaceClass));
        }
        return SystemSetupApi().MakeList(interfaceClass);
    }

    std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) override {
        std::vector<std::string> paths;
        const DeviceList list = MakeList(interfaceClass, true);
        for (const InterfaceList::Entry& entry : list ? list->entries : std::vector<InterfaceList::Entry>()) {
            if (entry.code == Errors::Success) {
                paths.push_back(entry.path);
            }
        }
        return paths;
    }

    Handle Open(const std::string& path) override {
        if (CallMustFail("Open")) {
            return InvalidHandle();
        }
        return ::CreateFileA(path.c_str(), GENERIC_READ | GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE,
                             nullptr, OPEN_EXISTING, FILE_FLAG_OVERLAPPED, nullptr);
    }

    bool CloseFile(Handle file) override {
        // A driver need not notice the close of a file while transfers of it are pending.
        ::CancelIo(file);
        return ::CloseHandle(file) != 0;
    }

    bool Start(Handle file, const Operation& operation, Overlapped& record) override {
        if (CallMustFail("Start")) {
            return false;
        }
        DWORD unused = 0;
        OVERLAPPED* const system = SystemRecord(record);
        const auto [kind, data, length, code, input] = operation;
        if (kind == Operation::Kind::Read) {
            return ::ReadFile(file, data, length, &unused, system) != 0;
        }
        if (kind == Operation::Kind::Write) {
            return ::WriteFile(file, data, length, &unused, system) != 0;
        }
        // The input is only read; the system's declaration leaves that out.
        return ::DeviceIoControl(file, code, const_cast<std::uint8_t*>(input.data()),
                                 static_cast<DWORD>(input.size()), data, length, &unused, system) != 0;
    }

    bool GetResult(Handle file, Overlapped& record, std::uint32_t& transferred, bool wait) override {
        if (wait) {
            WaitForEnd(record);
        }
        DWORD moved = 0;
        const bool succeeded = ::GetOverlappedResult(file, SystemRecord(record), &moved, FALSE) != 0;
        transferred = moved;
        if (!succeeded && !HasEnded(record)) {
            return false;
        }
        // Asked for last: no failure put in here can pass for the end of a transfer that still runs.
        return !CallMustFail("GetResult") && succeeded;
    }

    bool CancelTransfers(Handle file) override {
        return !CallMustFail("CancelTransfers") && ::CancelIo(file) != 0;
    }

  private:
    static bool HasEnded(Overlapped& record) {
        const volatile ULONG_PTR& status = SystemRecord(record)->Internal;
        return status != static_cast<ULONG_PTR>(STATUS_PENDING);
    }

    /// The record, not the event, tells the end of a transfer: two transfers can share an event, and a wait
    /// elsewhere can have used up the signal. The event only shortens the wait. (The system's own waiting
    /// form of `GetOverlappedResult` waits for the event alone, in these cases for ever.)
    static void WaitForEnd(Overlapped& record) {
        constexpr DWORD CheckInterval = 10;
        bool tookSignalOfAnother = false;
        while (!HasEnded(record)) {
            if (record.event == NoHandle || tookSignalOfAnother) {
                ::Sleep(1);
            } else if (::WaitForSingleObject(record.event, CheckInterval) != WAIT_TIMEOUT) {
                tookSignalOfAnother = !HasEnded(record);
            }
        }
        if (tookSignalOfAnother) {
            ::SetEvent(record.event);
        }
    }
};

}  // namespace

DeviceFileSystem& SystemDeviceFiles() {
    static WindowsDeviceFiles files;
    return files;
}

}  // namespace Varnholt::Platform
