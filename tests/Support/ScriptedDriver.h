#pragma once

#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <thread>

#include "Platform/DeviceFiles.h"
#include "Platform/EventScheduler.h"
#include "Support/Bytes.h"

namespace Varnholt::Tests {

inline constexpr std::uint32_t Never = 0xFFFFFFFF;

/// How one transfer goes. Times are milliseconds.
struct Answer {
    /// What a read or an inward control brings; its size is the count. Outward transfers move everything.
    Bytes data{};
    Platform::ErrorCode code = Platform::Errors::Success;
    std::uint32_t after = 0;               ///< 0: completes inside its start
    std::optional<std::uint32_t> count{};  ///< instead of the true count

    Platform::ErrorCode refusal = Platform::Errors::Success;  ///< the start fails
    Platform::Handle completesThrough = Platform::NoHandle;   ///< put in the place of the record's event

    /// A cancelled transfer ends so late; `Never`: only the close of the file ends it. It brings `data`
    /// nevertheless when told so.
    std::uint32_t cancelledAfter = 0;
    bool cancelledWithData = false;

    std::function<void()> onStart{};  ///< called by the starter, before anything else
};

/// The kernel drivers as a script: the instrument's own below paths that begin with "native/", USBIO below
/// all others. Each place has answers of its own, taken in order: a pipe of the former, an endpoint of the
/// latter, a control code, and 0 for any control. Without an answer, controls and writes succeed at once and
/// reads stay pending. Writes into a buffer only between the start and the completion that it reports, and
/// keeps a transcript:
///     open PATH, close PATH
///     control CODE INPUT / DATA      outward: the bytes sent
///     control CODE INPUT / [LENGTH]  inward: the room for the answer
///     read PLACE [LENGTH], write PLACE DATA
///     cancel PLACE                   only where something was running
/// Any thread; no platform call is made with the lock held.
class ScriptedDriver final : public Platform::DeviceFileSystem {
  public:
    explicit ScriptedDriver(std::vector<std::string> devicePaths = {"native/1", "usbio/1"});
    ~ScriptedDriver() override;

    void Script(std::uint32_t place, Answer answer);
    void DropScript(std::uint32_t place);
    /// Called by every opener of the path: fails with its code, or goes on with `Success`.
    void OnOpen(const std::string& path, std::function<Platform::ErrorCode()> action);
    void RefuseOpen(const std::string& path, Platform::ErrorCode code) {
        OnOpen(path, [code] { return code; });
    }
    /// Completes the oldest running transfer of the pipe or endpoint; false if none runs.
    bool Complete(std::uint32_t place, const Answer& answer);

    /// What happened since the last call; the transfers are all but opens and closes of files.
    std::vector<std::string> TakeTranscript();
    std::vector<std::string> TakeTransfers();
    std::size_t OpenFiles() const;
    std::size_t Running(std::optional<std::uint32_t> place = {}) const;  ///< 0: controls; without one: all

    bool LoadEnumeration() override { return true; }
    std::vector<std::string> ListInterfaces(const Protocol::Guid& interfaceClass) override;
    Platform::Handle Open(const std::string& path) override;
    bool CloseFile(Platform::Handle file) override;
    bool Start(Platform::Handle file, const Platform::Operation& operation,
               Platform::Overlapped& record) override;
    bool GetResult(Platform::Handle file, Platform::Overlapped& record, std::uint32_t& transferred,
                   bool wait) override;
    bool CancelTransfers(Platform::Handle file) override;

  private:
    struct File {
        std::string path;
        std::uint32_t place;  ///< of its reads and writes
        bool isOpen = true;
    };
    struct Transfer {
        std::uint64_t number;
        const File* file;
        std::uint32_t place;
        Platform::Overlapped* record;
        std::uint8_t* target;  ///< null when nothing comes in
        std::uint32_t length;
        std::thread::id starter;
        Answer answer;
        bool isCancelled = false;
    };

    File* Find(Platform::Handle handle);
    Answer TakeAnswer(std::uint32_t place, std::uint32_t code, const Answer& usual);
    bool Control(File& file, const Platform::Operation& operation, Platform::Overlapped& record);
    /// `target`: null when nothing comes in.
    bool Begin(const File& file, const Platform::Operation& operation, std::string line, std::uint8_t* target,
               const Answer& usual, Platform::Overlapped& record);
    void End(std::uint64_t number, Platform::ErrorCode code, bool withData);
    void EndLater(std::uint64_t number, std::uint64_t microseconds, Platform::ErrorCode code, bool withData);
    void EndAll(const File& file);

    const std::vector<std::string> paths_;
    mutable std::mutex lock_;  ///< guards what follows
    std::deque<std::unique_ptr<File>> files_;
    std::deque<Transfer> running_;
    std::map<std::uint32_t, std::deque<Answer>> scripts_;
    std::map<std::string, std::function<Platform::ErrorCode()>> openActions_;
    std::vector<std::string> transcript_;
    std::uint64_t lastNumber_ = 0;
};

}  // namespace Varnholt::Tests
