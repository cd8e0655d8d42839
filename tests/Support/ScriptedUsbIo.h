#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "Platform/DeviceFiles.h"
#include "Platform/EventScheduler.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Tests {

/// How one transfer or control of the USBIO driver goes. Times are milliseconds.
struct UsbIoAnswer {
    static constexpr std::uint32_t Never = 0xFFFFFFFF;

    /// What comes in; outward transfers move everything.
    std::vector<std::uint8_t> data{};
    std::uint32_t code = 0;
    std::uint32_t after = 0;                       ///< 0: completes inside its start
    bool refused = false;                          ///< the start itself fails, with `code`
    std::optional<std::uint32_t> reportedCount{};  ///< instead of the true one

    /// A cancelled transfer ends so late and with this code; with all of `data`, or with nothing moved.
    std::uint32_t cancelledAfter = 0;
    std::uint32_t cancelledCode = Platform::Errors::OperationAborted;
    bool cancelledWithData = false;

    std::function<void()> onStart{};  ///< called by the starter first
};

/// The USBIO driver as a script: answers are taken in order, per control code and per endpoint. Without one,
/// controls and writes succeed at once and reads stay pending. A buffer is written to only between the start
/// of its transfer and the completion that is reported. The transcript has one line for each call:
///     open PATH, close PATH
///     control CODE INPUT / DATA      CODE and bytes in hex; DATA as [ROOM] where data come in
///     read ENDPOINT [LENGTH], write ENDPOINT DATA
///     cancel ENDPOINT                only where something was running
/// Any thread; no platform call is made with the lock held.
class ScriptedUsbIo final : public Platform::DeviceFileSystem {
  public:
    explicit ScriptedUsbIo(std::vector<std::string> devicePaths = {"usbio/1"});
    ~ScriptedUsbIo() override;

    void ScriptControl(std::uint32_t code, UsbIoAnswer answer);
    void Script(std::uint8_t endpoint, UsbIoAnswer answer);
    void RefuseOpen(const std::string& path, Platform::ErrorCode code);

    /// Completes the oldest transfer that runs on the endpoint; false if none does.
    bool Complete(std::uint8_t endpoint);

    /// What happened since the last call.
    std::vector<std::string> TakeTranscript();
    std::size_t OpenFiles() const;
    std::size_t Running(std::uint8_t endpoint) const;
    /// What all reads of the endpoint brought in together.
    std::uint64_t BytesIn(std::uint8_t endpoint) const;
    /// The most controls that were ever running at once.
    std::size_t MostControlsAtOnce() const;

    std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) override;
    Platform::Handle Open(const std::string& path) override;
    bool CloseFile(Platform::Handle file) override;
    bool StartRead(Platform::Handle file, void* buffer, std::uint32_t length,
                   Platform::Overlapped& record) override;
    bool StartWrite(Platform::Handle file, const void* buffer, std::uint32_t length,
                    Platform::Overlapped& record) override;
    bool StartControl(Platform::Handle file, std::uint32_t code, const void* input, std::uint32_t inputSize,
                      void* output, std::uint32_t outputSize, Platform::Overlapped& record) override;
    bool GetResult(Platform::Handle file, Platform::Overlapped& record, std::uint32_t& transferred,
                   bool wait) override;
    bool CancelTransfers(Platform::Handle file) override;

  private:
    struct File {
        std::string path;
        std::uint8_t endpoint = 0;  ///< that the file is bound to
        bool isOpen = true;
    };
    struct Transfer {
        std::uint64_t number;
        const File* file;
        bool isControl;
        Platform::Overlapped* record;
        std::uint8_t* target;  ///< null when nothing comes in
        std::uint32_t length;
        std::thread::id starter;
        UsbIoAnswer answer;
        bool isCancelled = false;
    };

    File* Find(Platform::Handle handle);
    /// `scriptKey` names the answers: a control code or an endpoint.
    bool Start(const File& file, bool isControl, std::string line, std::uint8_t* target, std::uint32_t length,
               std::uint32_t scriptKey, const UsbIoAnswer& usual, Platform::Overlapped& record);
    void End(std::uint64_t number, Platform::ErrorCode code, bool withData);
    void EndLater(std::uint64_t number, std::uint32_t after, Platform::ErrorCode code, bool withData);
    void EndAll(const File& file);

    const std::vector<std::string> paths;
    mutable std::mutex lock;  ///< guards what follows
    std::deque<std::unique_ptr<File>> files;
    std::deque<Transfer> running;
    std::map<std::uint32_t, std::deque<UsbIoAnswer>> answers;
    std::map<std::string, Platform::ErrorCode> refusals;
    std::vector<std::string> transcript;
    std::vector<Platform::EventScheduler::EventId> events;
    std::map<std::uint8_t, std::uint64_t> bytesIn;
    std::uint64_t lastNumber = 0;
    std::size_t mostControls = 0;
};

}  // namespace Varnholt::Tests
