#include "Platform/Drivers/DriverFileSystem.h"

#include <map>
#include <mutex>
#include <new>
#include <optional>
#include <string_view>
#include <utility>

#include "Platform/CallFilter.h"
#include "Platform/Drivers/NativeDriverFile.h"
#include "Platform/Drivers/OpenFile.h"
#include "Platform/Drivers/RecordState.h"
#include "Platform/Drivers/UsbIoDevice.h"
#include "Platform/Drivers/UsbIoDriverFile.h"
#include "Platform/HandleMap.h"
#include "Platform/WaitableObjects.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Platform::Drivers {
namespace {

constexpr std::string_view NativePrefix = "native/";
constexpr std::string_view UsbIoPrefix = "usbio/";

struct DevicePath {
    bool isUsbIo;
    std::string name;
    std::uint32_t pipe;
};

std::optional<DevicePath> Parse(std::string_view path) {
    const bool isUsbIo = path.starts_with(UsbIoPrefix);
    if (!isUsbIo && !path.starts_with(NativePrefix)) {
        return std::nullopt;
    }
    path.remove_prefix(isUsbIo ? UsbIoPrefix.size() : NativePrefix.size());
    const auto [name, pipe] = Protocol::NativeDriver::SplitPipePath(path);
    const bool isPipe = pipe != Protocol::NativeDriver::ControlPipe;
    if (name.find('\\') != name.npos || (isUsbIo && isPipe)) {
        return std::nullopt;
    }
    return DevicePath{isUsbIo, std::string(name), pipe};
}

/// Handles of files have the top bit set, which no handle of the system has.
constexpr std::uintptr_t FirstHandle = 0x80000002;

/// More than any host needs: one that forgets to close files is told.
constexpr std::size_t MostOpenFiles = 1024;

class DriverFileSystem final : public DeviceFileSystem {
  public:
    explicit DriverFileSystem(Usb::UsbBus& usbBus) : bus_(usbBus) {}
    /// Closes what was left open; nobody else is in here any more.
    ~DriverFileSystem() override;

    std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) override;
    Handle Open(const std::string& path) override;
    bool CloseFile(Handle file) override;
    bool Start(Handle file, const Operation& operation, Overlapped& record) override;
    bool GetResult(Handle file, Overlapped& record, std::uint32_t& transferred, bool wait) override;
    bool CancelTransfers(Handle file) override;

  private:
    /// What the open files of one instrument share. It ends with the last of them.
    struct OpenDevice {
        std::weak_ptr<SharedDevice> device;
        std::weak_ptr<UsbIoDevice> usbIo;
    };

    std::unique_ptr<DriverFile> OpenOnDevice(const DevicePath& path, ErrorCode& error);
    void CancelEndpoint(const SharedDevice& device, std::uint8_t endpoint);

    Usb::UsbBus& bus_;
    /// Guards the devices. It is held while devices are opened and closed, so that one which is being closed
    /// is not found in use by its own process. Taken before all other locks.
    RecursiveMutex opening_;
    std::map<std::string, OpenDevice> devices_;

    HandleMap<OpenFile, FirstHandle> files_;
};

DriverFileSystem::~DriverFileSystem() {
    Handle file = NoHandle;
    while (const std::shared_ptr<OpenFile> open = files_.FindBehind(file)) {
        open->Close();
    }
}

std::vector<std::string> DriverFileSystem::ListInterfaces(const Protocol::Guid& interfaceClass) {
    const bool isUsbIo = interfaceClass == Protocol::UsbIoDriver::InterfaceClass;
    if (!isUsbIo && interfaceClass != Protocol::NativeDriver::InterfaceClass) {
        return {};
    }
    std::vector<std::string> paths = bus_.List();
    for (std::string& path : paths) {
        path.insert(0, isUsbIo ? UsbIoPrefix : NativePrefix);
    }
    return paths;
}

Handle DriverFileSystem::Open(const std::string& path) {
    if (CallMustFail("Open")) {
        return InvalidHandle();
    }
    ErrorCode error = Errors::FileNotFound;
    try {
        const std::optional<DevicePath> parsed = Parse(path);
        if (parsed) {
            const std::lock_guard holder(opening_);
            std::unique_ptr<DriverFile> driver = OpenOnDevice(*parsed, error);
            if (driver && files_.Size() < MostOpenFiles) {
                return files_.Add(std::make_shared<OpenFile>(std::move(driver)));
            }
            error = driver ? Errors::NoSystemResources : error;
        }
    } catch (const std::bad_alloc&) {
        error = Errors::NotEnoughMemory;
    } catch (...) {
        error = Errors::GeneralFailure;
    }
    SetLastError(error);
    return InvalidHandle();
}

std::unique_ptr<DriverFile> DriverFileSystem::OpenOnDevice(const DevicePath& path, ErrorCode& error) {
    if (!bus_.Has(path.name)) {
        error = Errors::FileNotFound;
        return nullptr;
    }
    OpenDevice& open = devices_[path.name];
    std::shared_ptr<SharedDevice> device = open.device.lock();
    if (!device || device->IsGone()) {
        // A device that was unplugged stays gone for the files that are open on it; this is another one.
        const auto abort = [this](const SharedDevice& aborted, std::uint8_t endpoint) {
            CancelEndpoint(aborted, endpoint);
        };
        device = std::make_shared<SharedDevice>(bus_, path.name, abort);
        open = {device, {}};
    }
    if (!path.isUsbIo) {
        return NativeDriverFile::Open(std::move(device), path.pipe, error);
    }
    std::shared_ptr<UsbIoDevice> usbIo = open.usbIo.lock();
    if (!usbIo) {
        usbIo = std::make_shared<UsbIoDevice>(std::move(device));
        open.usbIo = usbIo;
    }
    return std::make_unique<UsbIoDriverFile>(std::move(usbIo));
}

bool DriverFileSystem::CloseFile(Handle file) {
    const std::shared_ptr<OpenFile> open = files_.Find(file);
    std::unique_ptr<DriverFile> driver = open ? open->Close() : nullptr;
    if (!driver) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    const std::lock_guard holder(opening_);
    driver.reset();
    std::erase_if(devices_, [](const auto& entry) { return entry.second.device.expired(); });
    files_.Take(file);
    return true;
}

bool DriverFileSystem::Start(Handle file, const Operation& operation, Overlapped& record) {
    if (CallMustFail("Start")) {
        return RefuseStart(record, LastError());
    }
    const std::shared_ptr<OpenFile> open = files_.Find(file);
    if (!open) {
        return RefuseStart(record, Errors::InvalidHandle);
    }
    if (operation.data == nullptr && operation.length > 0) {
        return RefuseStart(record, Errors::InvalidParameter);
    }
    return open->Start(operation, record);
}

bool DriverFileSystem::GetResult(Handle file, Overlapped& record, std::uint32_t& transferred, bool wait) {
    if (IsRunning(record)) {
        const std::shared_ptr<OpenFile> open = wait ? files_.Find(file) : nullptr;
        if (!open || !open->WaitFor(record)) {
            transferred = 0;
            SetLastError(Errors::IoIncomplete);
            return false;
        }
    }
    const ErrorCode code = OutcomeOf(record, transferred);
    // Asked for last: no failure put in here can pass for the end of a transfer that still runs.
    if (CallMustFail("GetResult")) {
        return false;
    }
    SetLastError(code);
    return code == Errors::Success;
}

bool DriverFileSystem::CancelTransfers(Handle file) {
    if (CallMustFail("CancelTransfers")) {
        return false;
    }
    const std::shared_ptr<OpenFile> open = files_.Find(file);
    if (!open) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    open->CancelOwn();
    return true;
}

void DriverFileSystem::CancelEndpoint(const SharedDevice& device, std::uint8_t endpoint) {
    Handle file = NoHandle;
    while (const std::shared_ptr<OpenFile> open = files_.FindBehind(file)) {
        open->CancelEndpoint(device, endpoint);
    }
}

}  // namespace

std::unique_ptr<DeviceFileSystem> MakeDriverFileSystem(Usb::UsbBus& bus) {
    return std::make_unique<DriverFileSystem>(bus);
}

}  // namespace Varnholt::Platform::Drivers
