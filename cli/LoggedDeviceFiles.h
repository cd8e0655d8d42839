#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "Platform/DeviceFiles.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Cli {

/// Device files that tell of each command and transfer that ends, whichever driver it goes through; what a
/// driver is asked for itself is left out. Everything passes through to `below`.
class LoggedDeviceFiles final : public Platform::DeviceFileSystem {
  public:
    using Handle = Platform::Handle;
    using Overlapped = Platform::Overlapped;
    /// Called for one line at a time, on the thread that learns of the end.
    using Log = std::function<void(const std::string& line)>;

    /// `underlying` must outlive the object.
    LoggedDeviceFiles(Platform::DeviceFileSystem& underlying, Log tell);
    LoggedDeviceFiles(const LoggedDeviceFiles&) = delete;
    LoggedDeviceFiles& operator=(const LoggedDeviceFiles&) = delete;

    bool LoadEnumeration() override { return below_.LoadEnumeration(); }
    std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) override;
    Handle Open(const std::string& path) override;
    bool CloseFile(Handle file) override;
    bool StartRead(Handle file, void* buffer, std::uint32_t length, Overlapped& record) override;
    bool StartWrite(Handle file, const void* buffer, std::uint32_t length, Overlapped& record) override;
    bool StartControl(Handle file, std::uint32_t code, const void* input, std::uint32_t inputSize,
                      void* output, std::uint32_t outputSize, Overlapped& record) override;
    bool GetResult(Handle file, Overlapped& record, std::uint32_t& transferred, bool wait) override;
    bool CancelTransfers(Handle file) override;

  private:
    /// What a transfer was, once it is known how many bytes it has moved.
    using Description = std::function<std::string(std::uint32_t transferred)>;
    struct RunningTransfer {
        Handle file;
        Description describe;
    };

    template <class Start>
    bool StartTransfer(Handle file, const Overlapped& record, Description describe, Start start);
    void Ended(const Overlapped& record, std::uint32_t transferred, bool succeeded);

    Platform::DeviceFileSystem& below_;
    const Log log_;
    Platform::RecursiveMutex section_;  ///< guards what follows, and the log
    std::map<const Overlapped*, RunningTransfer> running_;
    std::vector<Handle> interruptFiles_;  ///< whose reads wait for the button
};

}  // namespace Varnholt::Cli
