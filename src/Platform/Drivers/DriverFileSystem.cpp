#include "Platform/Drivers/DriverFileSystem.h"

#include <array>
#include <atomic>
#include <map>
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
    const std::string_view name = path.substr(0, path.find('\\'));
    path.remove_prefix(name.size());
    std::uint32_t pipe = Protocol::NativeDriver::ControlPipe;
    if (!path.empty()) {
        constexpr std::string_view Suffix = Protocol::NativeDriver::PipeSuffix;
        const bool isPipe = path.size() == Suffix.size() + 1 && path.starts_with(Suffix) &&
                            path.back() >= '1' && path.back() <= '3';
        if (isUsbIo || !isPipe) {
            return std::nullopt;
        }
        pipe = static_cast<std::uint32_t>(path.back() - '0');
    }
    return DevicePath{isUsbIo, std::string(name), pipe};
}

/// A handle holds the place of a file in the table and its generation, between a top bit that no handle of
/// the system has set and two low bits that these have clear.
namespace HandleLayout {
constexpr std::uint32_t Mark = 0x80000002;
constexpr std::uint32_t PlaceShift = 2;
constexpr std::uint32_t PlaceBits = 10;
constexpr std::uint32_t GenerationShift = PlaceShift + PlaceBits;
constexpr std::uint32_t GenerationMask = (1U << OpenFile::GenerationBits) - 1;
static_assert(GenerationShift + OpenFile::GenerationBits == 31);
constexpr std::uint32_t Places = 1U << PlaceBits;
}  // namespace HandleLayout

Handle MakeHandle(std::uint32_t place, std::uint32_t generation) {
    const std::uint32_t value =
        HandleLayout::Mark | place << HandleLayout::PlaceShift | generation << HandleLayout::GenerationShift;
    return reinterpret_cast<Handle>(static_cast<std::uintptr_t>(value));
}

class DriverFileSystem final : public DeviceFileSystem, public EndpointCanceller {
  public:
    explicit DriverFileSystem(Usb::UsbBus& usbBus) : bus_(usbBus) {}
    ~DriverFileSystem() override;

    std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) override;
    Handle Open(const std::string& path) override;
    bool CloseFile(Handle file) override;
    bool StartRead(Handle file, void* buffer, std::uint32_t length, Overlapped& record) override;
    bool StartWrite(Handle file, const void* buffer, std::uint32_t length, Overlapped& record) override;
    bool StartControl(Handle file, std::uint32_t code, const void* input, std::uint32_t inputSize,
                      void* output, std::uint32_t outputSize, Overlapped& record) override;
    bool GetResult(Handle file, Overlapped& record, std::uint32_t& transferred, bool wait) override;
    bool CancelTransfers(Handle file) override;
    void CancelEndpoint(const SharedDevice& device, std::uint8_t endpoint) override;

  private:
    /// What the open files of one instrument share. It ends with the last of them.
    struct Instrument {
        std::weak_ptr<SharedDevice> device;
        std::weak_ptr<UsbIoDevice> usbIo;
    };

    std::unique_ptr<DriverFile> OpenOnDevice(const DevicePath& path, ErrorCode& error);
    OpenFile* FreePlace();
    OpenFile* Find(Handle file) const;
    bool Start(std::string_view call, Handle file, const Operation& operation, Overlapped& record);
    bool Close(OpenFile& open, std::uint32_t generation);

    Usb::UsbBus& bus_;
    /// Guards the instruments and the occupation of places. It is held while devices are opened and closed,
    /// so that one which is being closed is not found in use by its own process. Taken before all other
    /// locks.
    CriticalSection opening_;
    std::map<std::string, Instrument> instruments_;
    /// A file once made stays in its place to the end, so that it can be looked up without a lock.
    std::array<std::atomic<OpenFile*>, HandleLayout::Places> places_{};
};

std::uint32_t GenerationOf(Handle file) {
    const auto value = reinterpret_cast<std::uintptr_t>(file);
    return static_cast<std::uint32_t>(value) >> HandleLayout::GenerationShift & HandleLayout::GenerationMask;
}

// Files that were left open are closed; nobody else is in here any more.
DriverFileSystem::~DriverFileSystem() {
    for (auto& place : places_) {
        OpenFile* const file = place.load();
        if (file == nullptr) {
            break;
        }
        file->Close(file->Generation());
        delete file;
    }
}

std::vector<std::string> DriverFileSystem::ListInterfaces(const Protocol::Guid& interfaceClass) {
    std::string_view prefix;
    if (interfaceClass == Protocol::NativeDriver::InterfaceClass) {
        prefix = NativePrefix;
    } else if (interfaceClass == Protocol::UsbIoDriver::InterfaceClass) {
        prefix = UsbIoPrefix;
    } else {
        return {};
    }
    std::vector<std::string> paths = bus_.List();
    for (std::string& path : paths) {
        path.insert(0, prefix);
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
            const CriticalSection::Holder holder(opening_);
            OpenFile* const place = FreePlace();
            error = Errors::NoSystemResources;
            if (place != nullptr) {
                std::unique_ptr<DriverFile> driver = OpenOnDevice(*parsed, error);
                if (driver) {
                    return MakeHandle(place->index, place->Open(std::move(driver)));
                }
            }
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
    Instrument& instrument = instruments_[path.name];
    std::shared_ptr<SharedDevice> device = instrument.device.lock();
    if (!device || device->IsGone()) {
        // A device that was unplugged stays gone for the files that are open on it; this is another one.
        device = std::make_shared<SharedDevice>(bus_, path.name);
        instrument = {device, {}};
    }
    if (!path.isUsbIo) {
        return NativeDriverFile::Open(std::move(device), path.pipe, *this, error);
    }
    std::shared_ptr<UsbIoDevice> usbIo = instrument.usbIo.lock();
    if (!usbIo) {
        usbIo = std::make_shared<UsbIoDevice>(std::move(device));
        instrument.usbIo = usbIo;
    }
    return std::make_unique<UsbIoDriverFile>(std::move(usbIo), *this);
}

OpenFile* DriverFileSystem::FreePlace() {
    for (std::uint32_t index = 0; index < places_.size(); ++index) {
        OpenFile* file = places_[index].load(std::memory_order_relaxed);
        if (file == nullptr) {
            file = new OpenFile(index);
            places_[index].store(file, std::memory_order_release);
        }
        if (file->IsFree()) {
            return file;
        }
    }
    return nullptr;
}

OpenFile* DriverFileSystem::Find(Handle file) const {
    const auto value = reinterpret_cast<std::uintptr_t>(file);
    constexpr std::uintptr_t Fixed = ~std::uintptr_t{0x7FFFFFFF} | ((1U << HandleLayout::PlaceShift) - 1);
    if ((value & Fixed) != HandleLayout::Mark) {
        return nullptr;
    }
    return places_[value >> HandleLayout::PlaceShift & (HandleLayout::Places - 1)].load(
        std::memory_order_acquire);
}

bool DriverFileSystem::CloseFile(Handle file) {
    if (CallMustFail("CloseFile")) {
        return false;
    }
    OpenFile* const open = Find(file);
    if (open == nullptr || !Close(*open, GenerationOf(file))) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    return true;
}

bool DriverFileSystem::Close(OpenFile& open, std::uint32_t generation) {
    std::unique_ptr<DriverFile> driver = open.Close(generation);
    if (!driver) {
        return false;
    }
    const CriticalSection::Holder holder(opening_);
    driver.reset();
    open.Free();
    std::erase_if(instruments_, [](const auto& entry) { return entry.second.device.expired(); });
    return true;
}

bool DriverFileSystem::Start(std::string_view call, Handle file, const Operation& operation,
                             Overlapped& record) {
    OpenFile* const open = Find(file);
    ErrorCode error = Errors::Success;
    if (CallMustFail(call)) {
        error = LastError();
    } else if (open == nullptr) {
        error = Errors::InvalidHandle;
    } else if (operation.data == nullptr && operation.length > 0) {
        error = Errors::InvalidParameter;
    } else {
        return open->Start(GenerationOf(file), operation, record);
    }
    MarkNotStarted(record, error);
    SetLastError(error);
    return false;
}

bool DriverFileSystem::StartRead(Handle file, void* buffer, std::uint32_t length, Overlapped& record) {
    return Start("StartRead", file,
                 {Operation::Kind::Read, 0, {}, static_cast<std::uint8_t*>(buffer), length}, record);
}

bool DriverFileSystem::StartWrite(Handle file, const void* buffer, std::uint32_t length, Overlapped& record) {
    // A transfer has one buffer for both directions; that of a write is only read.
    auto* const data = static_cast<std::uint8_t*>(const_cast<void*>(buffer));
    return Start("StartWrite", file, {Operation::Kind::Write, 0, {}, data, length}, record);
}

bool DriverFileSystem::StartControl(Handle file, std::uint32_t code, const void* input,
                                    std::uint32_t inputSize, void* output, std::uint32_t outputSize,
                                    Overlapped& record) {
    const std::span<const std::uint8_t> in(static_cast<const std::uint8_t*>(input),
                                           input != nullptr ? inputSize : 0);
    return Start("StartControl", file,
                 {Operation::Kind::Control, code, in, static_cast<std::uint8_t*>(output), outputSize},
                 record);
}

bool DriverFileSystem::GetResult(Handle file, Overlapped& record, std::uint32_t& transferred, bool wait) {
    if (IsRunning(record)) {
        OpenFile* const open = wait ? Find(file) : nullptr;
        if (open == nullptr || !open->WaitFor(GenerationOf(file), record)) {
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
    OpenFile* const open = Find(file);
    if (open == nullptr || !open->CancelOwn(GenerationOf(file))) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    return true;
}

void DriverFileSystem::CancelEndpoint(const SharedDevice& device, std::uint8_t endpoint) {
    for (const auto& place : places_) {
        OpenFile* const file = place.load(std::memory_order_acquire);
        if (file == nullptr) {
            return;
        }
        file->CancelEndpoint(device, endpoint);
    }
}

}  // namespace

std::unique_ptr<DeviceFileSystem> MakeDriverFileSystem(Usb::UsbBus& bus) {
    return std::make_unique<DriverFileSystem>(bus);
}

}  // namespace Varnholt::Platform::Drivers
