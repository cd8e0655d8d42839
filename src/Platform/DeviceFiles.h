#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "Platform/DeviceInterfaces.h"
#include "Platform/ErrorCodes.h"
#include "Platform/Handle.h"
#include "Protocol/Guid.h"

namespace Varnholt::Platform {

/// The system's record of one outstanding overlapped operation; its layout is the one that Windows fixes. Set
/// `event` (an auto-reset event that outlives the operation) and leave the rest to the device files.
/// A record may be copied only while no operation runs on it.
struct Overlapped {
    std::uintptr_t internal = 0;
    std::uintptr_t internalHigh = 0;
    std::uint32_t offset = 0;
    std::uint32_t offsetHigh = 0;
    Handle event = NoHandle;
};

/// What a transfer is to do. The buffers are the caller's.
struct Operation {
    enum class Kind { Read, Write, Control };

    static Operation Read(void* buffer, std::uint32_t size) {
        return {Kind::Read, static_cast<std::uint8_t*>(buffer), size, 0, {}};
    }
    static Operation Write(const void* buffer, std::uint32_t size) {
        return {Kind::Write, static_cast<std::uint8_t*>(const_cast<void*>(buffer)), size, 0, {}};
    }
    static Operation Control(std::uint32_t controlCode, std::span<const std::uint8_t> block, void* output,
                             std::uint32_t outputSize) {
        return {Kind::Control, static_cast<std::uint8_t*>(output), outputSize, controlCode, block};
    }

    Kind kind;
    std::uint8_t* data;    ///< what is read into, written from (and only read then), or a control's output
    std::uint32_t length;  ///< of the data
    std::uint32_t code;    ///< of a control
    std::span<const std::uint8_t> input;  ///< of a control
};

/// The files that drivers present: devices and the pipes below them, opened by path, moved by overlapped
/// transfers.
///
/// A transfer's record and buffer belong to the transfer from its start until it has completed: `GetResult`
/// answering anything but `Errors::IoIncomplete` is the only proof of that. Use `OverlappedRequest`, which
/// sees to it.
///
/// Operations that return bool answer false on failure with the code in `LastError`. All may be called from
/// any thread.
class DeviceFileSystem {
  public:
    virtual ~DeviceFileSystem() = default;

    /// Loads what `ListInterfaces` needs of the system; false when it cannot be had, and every list is empty.
    virtual bool LoadEnumeration() { return true; }
    /// The paths of the interfaces of `interfaceClass` that are present, in a stable order.
    virtual std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) = 0;
    /// As `DeviceInterfaces::MakeList`.
    virtual DeviceList MakeList(const Protocol::Guid& interfaceClass, bool /*withRegistryFallback*/) {
        return std::make_shared<InterfaceList>(interfaceClass, ListInterfaces(interfaceClass));
    }

    /// Opens an existing device or pipe for reading and writing, shared, overlapped. `InvalidHandle()` on
    /// failure.
    virtual Handle Open(const std::string& path) = 0;
    /// Transfers still running on the handle are ended and completed before the file is gone.
    virtual bool CloseFile(Handle file) = 0;

    /// Starts a transfer: true when it completed at once, false with `Errors::IoPending` when it runs, false
    /// with another code when it could not be started. The record's event is reset at the start and signalled
    /// at completion, also when the transfer completes at once.
    virtual bool Start(Handle file, const Operation& operation, Overlapped& record) = 0;

    /// The outcome of the record's transfer: true and the bytes moved, or false with the transfer's code.
    /// `Errors::IoIncomplete` while it runs, unless `wait` is set: then it is waited for, as long as its
    /// driver lets it run. On Linux the USBIO behaviour ends controls after 5 s and writes after 5 s and 10
    /// ms a byte; nothing else ends by itself. `transferred` is set whenever the transfer has completed, also
    /// on failure: a cancelled transfer can have moved data.
    virtual bool GetResult(Handle file, Overlapped& record, std::uint32_t& transferred, bool wait) = 0;

    /// Asks for the end of the transfers that the calling thread started on `file`; they complete with
    /// `Errors::OperationAborted` (or with what they had reached) in bounded time.
    virtual bool CancelTransfers(Handle file) = 0;
};

/// The file system in force: the operating system's, unless a test put another in its place.
DeviceFileSystem& DeviceFiles();

/// Puts `fileSystem` in the place of the one in force for the object's life: a test's own, or one that stands
/// before the system's. Not while files are open.
class ScopedDeviceFiles final {
  public:
    explicit ScopedDeviceFiles(DeviceFileSystem& fileSystem);
    ~ScopedDeviceFiles();
    ScopedDeviceFiles(const ScopedDeviceFiles&) = delete;
    ScopedDeviceFiles& operator=(const ScopedDeviceFiles&) = delete;

  private:
    DeviceFileSystem* const previous_;
};

/// For `DeviceFiles`: the implementation's own file system.
DeviceFileSystem& SystemDeviceFiles();

}  // namespace Varnholt::Platform
