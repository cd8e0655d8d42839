#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <span>
#include <string>
#include <vector>

#include "Platform/DeviceFiles.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Service {

/// Device files that another thread can interrupt: what lets a program end a scan, which otherwise returns
/// only when the instrument says so. Put in force with `Platform::ScopedDeviceFiles`; everything passes
/// through to `below`. They can also tell of each command and transfer that ends, whichever driver it goes
/// through; what a driver is asked for itself is left out.
///
/// An interruption asks the driver to abort the pipes on which transfers run, in the driver's own way: the
/// USBIO driver through the pipe's file, the instrument's own driver through the device's. What waits for the
/// transfers sees them fail and unwinds as after any other failure. The files stay open.
class InterruptibleDeviceFiles final : public Platform::DeviceFileSystem {
  public:
    using Handle = Platform::Handle;
    using Overlapped = Platform::Overlapped;

    /// Called for one line at a time, on the thread that learns of the end.
    using Log = std::function<void(const std::string& line)>;

    /// `underlying` must outlive the object.
    explicit InterruptibleDeviceFiles(Platform::DeviceFileSystem& underlying, Log tell = {});
    InterruptibleDeviceFiles(const InterruptibleDeviceFiles&) = delete;
    InterruptibleDeviceFiles& operator=(const InterruptibleDeviceFiles&) = delete;

    /// Ends the reads and writes that run, and refuses new transfers and controls with
    /// `Platform::Errors::OperationAborted` until `Resume`: on the files of the device with this identifier,
    /// or of all devices when it is empty. What waits for the button goes on: an aborted interrupt pipe would
    /// look like an instrument that is gone. The event of what is refused is signalled: the instrument's own
    /// driver has callers that wait for it although nothing was started. Returns within 2 s for each pipe.
    /// Any thread.
    void Interrupt(const std::string& device);
    /// Transfers may start again on the files of that device; with none, after an interruption of all.
    void Resume(const std::string& device);

    bool LoadEnumeration() override { return below_.LoadEnumeration(); }
    std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) override;
    Handle Open(const std::string& path) override;
    bool CloseFile(Handle file) override;
    bool Start(Handle file, const Platform::Operation& operation, Overlapped& record) override;
    bool GetResult(Handle file, Overlapped& record, std::uint32_t& transferred, bool wait) override;
    bool CancelTransfers(Handle file) override;

  private:
    struct OpenedFile {
        Handle handle;
        std::string device;
        std::uint32_t pipe;   ///< of the instrument's own driver
        bool waitsForButton;  ///< the interrupt pipe's
    };
    /// What a transfer was, once it is known how many bytes it has moved.
    using Description = std::function<std::string(std::uint32_t transferred)>;
    struct RunningTransfer {
        Handle file;
        bool isOnPipe;         ///< and not a control
        Description describe;  ///< empty: its end is told nobody
    };

    Description DescriptionOf(const OpenedFile* opened, const Platform::Operation& operation) const;
    void Ended(const Overlapped& record, std::uint32_t transferred, bool succeeded);
    static bool Refuse(const Overlapped& record, Platform::ErrorCode code);
    void AbortPipe(const OpenedFile& file);
    void Control(Handle file, std::uint32_t code, std::span<const std::uint8_t> block);
    OpenedFile* Find(Handle file);
    bool IsInterrupted(Handle file);

    Platform::DeviceFileSystem& below_;
    /// Guards what follows, and keeps files from being closed while their pipes are aborted.
    Platform::RecursiveMutex section_;
    std::vector<std::string> interrupted_;  ///< devices; an empty one: all
    std::vector<OpenedFile> files_;
    std::map<const Overlapped*, RunningTransfer> running_;

    Platform::RecursiveMutex telling_;  ///< guards the log
    const Log log_;
};

}  // namespace Varnholt::Service
