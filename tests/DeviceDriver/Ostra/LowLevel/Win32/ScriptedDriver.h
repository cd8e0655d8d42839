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
#include "Support/ScriptedUsbDevice.h"

namespace Varnholt::Tests {

inline constexpr std::uint32_t Never = 0xFFFFFFFF;

/// How one transfer goes.
struct Answer {
    /// What a read or an inward control brings; its size is the count. Outward transfers move everything.
    Bytes data{};
    Platform::ErrorCode code = Platform::Errors::Success;
    std::uint32_t after = 0;               ///< milliseconds; 0: completes inside its start
    std::optional<std::uint32_t> count{};  ///< instead of the true count

    Platform::ErrorCode refusal = Platform::Errors::Success;  ///< the start fails
    Platform::Handle completesThrough = Platform::NoHandle;   ///< put in the place of the record's event

    /// A cancelled transfer ends so late, with this code; `Never`: only the close of the file ends it. It
    /// brings `data` nevertheless when told so.
    std::uint32_t cancelledAfter = 0;
    Platform::ErrorCode cancelledWith = Platform::Errors::OperationAborted;
    bool cancelledWithData = false;

    std::function<void()> onStart{};  ///< called by the starter, before anything else
};

/// The instrument's kernel driver as a script. Each pipe has answers of its own, taken in order; without one,
/// controls and writes succeed at once and reads stay pending. Writes into a buffer only between the start
/// and the completion that it reports, and keeps a transcript:
///     open PATH, close PATH             files, by path
///     control CODE BLOCK DATA           outward: the bytes sent
///     control CODE BLOCK [LENGTH]       inward: the room for the answer
///     read PIPE [LENGTH], write PIPE DATA
///     cancel PIPE                       only where something was running
/// Any thread; no platform call is made with the lock held.
class ScriptedDriver final : public Platform::DeviceFileSystem {
  public:
    explicit ScriptedDriver(std::vector<std::string> instrumentPaths = {"native/1"});
    ~ScriptedDriver() override;

    void Script(std::uint32_t pipe, Answer answer);
    void DropScript(std::uint32_t pipe);
    void RefuseOpen(const std::string& path, Platform::ErrorCode code);
    /// Called by every opener of the path, who waits for its end.
    void BeforeOpen(const std::string& path, std::function<void()> action);
    /// Completes the oldest running transfer of the pipe; false if none runs.
    bool Complete(std::uint32_t pipe, const Answer& answer);

    /// What happened since the last call, without opens and closes of files.
    std::vector<std::string> TakeTransfers();
    std::vector<std::string> TakeTranscript();
    std::uint32_t OpenFiles() const;
    std::uint32_t RunningTransfers() const;
    std::uint32_t Running(std::uint32_t pipe) const;

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
        std::uint32_t pipe;
        bool isOpen = true;
    };
    struct Transfer {
        std::uint64_t number;
        File* file;
        Platform::Overlapped* record;
        std::uint8_t* target;  ///< null when nothing comes in
        std::uint32_t length;
        std::thread::id starter;
        Answer answer;
        bool isCancelled = false;
    };

    File* Find(Platform::Handle handle) const;
    bool Start(File* file, std::string line, std::uint8_t* target, std::uint32_t length, const Answer& usual,
               Platform::Overlapped& record);
    void End(std::uint64_t number, Platform::ErrorCode code, bool withData);
    void EndLater(std::uint64_t number, std::uint64_t microseconds, Platform::ErrorCode code, bool withData);

    const std::vector<std::string> paths;
    mutable std::mutex lock;  ///< guards what follows
    std::deque<std::unique_ptr<File>> files;
    std::deque<Transfer> running;
    std::map<std::uint32_t, std::deque<Answer>> scripts;
    std::map<std::string, Platform::ErrorCode> refusals;
    std::map<std::string, std::function<void()>> openActions;
    std::vector<std::string> transcript;
    std::vector<Platform::EventScheduler::EventId> events;
    std::uint64_t lastNumber = 0;
};

}  // namespace Varnholt::Tests
