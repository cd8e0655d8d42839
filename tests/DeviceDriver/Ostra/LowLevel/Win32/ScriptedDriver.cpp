#include "ScriptedDriver.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <utility>

#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"
#include "Protocol/NativeDriver.h"

namespace Varnholt::Tests {

using namespace Platform;

namespace {

// What `Overlapped::internal` holds.
constexpr std::uintptr_t RunningMark = 0x103;
constexpr std::uintptr_t OutcomeMark = 0x10000;

std::uint32_t PipeOf(const std::string& path) {
    const std::string suffix = Protocol::NativeDriver::PipeSuffix;
    const std::size_t at = path.rfind(suffix);
    return at == std::string::npos ? 0 : static_cast<std::uint32_t>(path.at(at + suffix.size()) - '0');
}

}  // namespace

ScriptedDriver::ScriptedDriver(std::vector<std::string> instrumentPaths)
    : paths(std::move(instrumentPaths)) {}

ScriptedDriver::~ScriptedDriver() {
    for (const EventScheduler::EventId event : events) {
        ClockScheduler().Forget(event);
    }
}

void ScriptedDriver::Script(std::uint32_t pipe, Answer answer) {
    const std::lock_guard held(lock);
    scripts[pipe].push_back(std::move(answer));
}

void ScriptedDriver::DropScript(std::uint32_t pipe) {
    const std::lock_guard held(lock);
    scripts[pipe].clear();
}

void ScriptedDriver::RefuseOpen(const std::string& path, ErrorCode code) {
    const std::lock_guard held(lock);
    refusals[path] = code;
}

void ScriptedDriver::BeforeOpen(const std::string& path, std::function<void()> action) {
    const std::lock_guard held(lock);
    openActions[path] = std::move(action);
}

bool ScriptedDriver::Complete(std::uint32_t pipe, const Answer& answer) {
    std::uint64_t number = 0;
    {
        const std::lock_guard held(lock);
        const auto found = std::find_if(running.begin(), running.end(), [pipe](const Transfer& transfer) {
            return transfer.file->pipe == pipe;
        });
        if (found == running.end()) {
            return false;
        }
        found->answer = answer;
        number = found->number;
    }
    End(number, answer.code, true);
    return true;
}

std::vector<std::string> ScriptedDriver::TakeTranscript() {
    const std::lock_guard held(lock);
    return std::exchange(transcript, {});
}

std::vector<std::string> ScriptedDriver::TakeTransfers() {
    std::vector<std::string> lines = TakeTranscript();
    std::erase_if(lines, [](const std::string& line) {
        return line.rfind("open", 0) == 0 || line.rfind("close", 0) == 0;
    });
    return lines;
}

std::uint32_t ScriptedDriver::OpenFiles() const {
    const std::lock_guard held(lock);
    return static_cast<std::uint32_t>(
        std::count_if(files.begin(), files.end(), [](const auto& file) { return file->isOpen; }));
}

std::uint32_t ScriptedDriver::RunningTransfers() const {
    const std::lock_guard held(lock);
    return static_cast<std::uint32_t>(running.size());
}

std::uint32_t ScriptedDriver::Running(std::uint32_t pipe) const {
    const std::lock_guard held(lock);
    return static_cast<std::uint32_t>(
        std::count_if(running.begin(), running.end(),
                      [pipe](const Transfer& transfer) { return transfer.file->pipe == pipe; }));
}

std::vector<std::string> ScriptedDriver::ListInterfaces(const Protocol::Guid& interfaceClass) {
    return interfaceClass == Protocol::NativeDriver::InterfaceClass ? paths : std::vector<std::string>();
}

Handle ScriptedDriver::Open(const std::string& path) {
    std::function<void()> action;
    {
        const std::lock_guard held(lock);
        if (const auto found = openActions.find(path); found != openActions.end()) {
            action = found->second;
        }
    }
    if (action) {
        action();
    }
    ErrorCode refusal = Errors::Success;
    Handle opened = InvalidHandle();
    {
        const std::lock_guard held(lock);
        if (const auto refused = refusals.find(path); refused != refusals.end()) {
            refusal = refused->second;
        } else {
            files.push_back(std::make_unique<File>(File{path, PipeOf(path)}));
            transcript.push_back("open " + path);
            opened = files.back().get();
        }
    }
    SetLastError(refusal);
    return opened;
}

ScriptedDriver::File* ScriptedDriver::Find(Handle handle) const {
    for (const std::unique_ptr<File>& file : files) {
        if (file.get() == handle && file->isOpen) {
            return file.get();
        }
    }
    return nullptr;
}

bool ScriptedDriver::CloseFile(Handle handle) {
    File* file = nullptr;
    std::vector<std::uint64_t> ended;
    {
        const std::lock_guard held(lock);
        file = Find(handle);
        if (file) {
            file->isOpen = false;
            transcript.push_back("close " + file->path);
            for (const Transfer& transfer : running) {
                if (transfer.file == file) {
                    ended.push_back(transfer.number);
                }
            }
        }
    }
    if (!file) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    for (const std::uint64_t number : ended) {
        End(number, Errors::OperationAborted, false);
    }
    return true;
}

bool ScriptedDriver::StartRead(Handle handle, void* buffer, std::uint32_t length, Overlapped& record) {
    std::unique_lock held(lock);
    File* file = Find(handle);
    held.unlock();
    return Start(file, "read " + std::to_string(file ? file->pipe : 0) + " [" + std::to_string(length) + "]",
                 static_cast<std::uint8_t*>(buffer), length, {.after = Never}, record);
}

bool ScriptedDriver::StartWrite(Handle handle, const void* buffer, std::uint32_t length, Overlapped& record) {
    std::unique_lock held(lock);
    File* file = Find(handle);
    held.unlock();
    return Start(file,
                 "write " + std::to_string(file ? file->pipe : 0) + " " +
                     Hex(static_cast<const std::uint8_t*>(buffer), length),
                 nullptr, length, {}, record);
}

bool ScriptedDriver::StartControl(Handle handle, std::uint32_t code, const void* input,
                                  std::uint32_t inputSize, void* output, std::uint32_t outputSize,
                                  Overlapped& record) {
    std::unique_lock held(lock);
    File* file = Find(handle);
    held.unlock();
    const auto* block = static_cast<const std::uint8_t*>(input);
    auto* data = static_cast<std::uint8_t*>(output);
    char number[16];
    std::snprintf(number, sizeof number, "%X", code);
    const bool isInward = block[Protocol::NativeDriver::Block::Direction] != 0;
    return Start(file,
                 "control " + std::string(number) + " " + Hex(block, inputSize) + " / " +
                     (isInward ? "[" + std::to_string(outputSize) + "]" : Hex(data, outputSize)),
                 isInward ? data : nullptr, outputSize, {}, record);
}

bool ScriptedDriver::Start(File* file, std::string line, std::uint8_t* target, std::uint32_t length,
                           const Answer& usual, Overlapped& record) {
    if (!file) {
        SetLastError(Errors::InvalidHandle);
        return false;
    }
    Answer answer = usual;
    {
        const std::lock_guard held(lock);
        std::deque<Answer>& script = scripts[file->pipe];
        if (!script.empty()) {
            answer = script.front();
            script.pop_front();
        }
    }
    if (answer.onStart) {
        answer.onStart();
    }
    if (answer.refusal != Errors::Success) {
        SetLastError(answer.refusal);
        return false;
    }
    Wait(record.event, 0);  // resets it
    if (answer.completesThrough != NoHandle) {
        record.event = answer.completesThrough;
    }
    std::uint64_t number = 0;
    {
        const std::lock_guard held(lock);
        transcript.push_back(std::move(line));
        number = ++lastNumber;
        record.internal = RunningMark;
        record.internalHigh = 0;
        running.push_back({number, file, &record, target, length, std::this_thread::get_id(), answer});
    }
    if (answer.after == 0) {
        End(number, answer.code, true);
        if (answer.code != Errors::Success) {
            SetLastError(Errors::IoPending);
        }
        return answer.code == Errors::Success;
    }
    if (answer.after != Never) {
        EndLater(number, std::uint64_t{answer.after} * 1000, answer.code, true);
    }
    SetLastError(Errors::IoPending);
    return false;
}

void ScriptedDriver::EndLater(std::uint64_t number, std::uint64_t microseconds, ErrorCode code,
                              bool withData) {
    const EventScheduler::EventId event =
        ClockScheduler().CallAt(ClockScheduler().Now() + microseconds,
                                [this, number, code, withData] { End(number, code, withData); });
    const std::lock_guard held(lock);
    events.push_back(event);
}

void ScriptedDriver::End(std::uint64_t number, ErrorCode code, bool withData) {
    Handle event = NoHandle;
    {
        const std::lock_guard held(lock);
        const auto found = std::find_if(running.begin(), running.end(), [number](const Transfer& transfer) {
            return transfer.number == number;
        });
        if (found == running.end()) {
            return;
        }
        std::size_t moved = 0;
        if (withData && found->target) {
            moved = std::min<std::size_t>(found->answer.data.size(), found->length);
            std::copy_n(found->answer.data.begin(), moved, found->target);
        } else if (withData) {
            moved = found->length;
        }
        found->record->internalHigh = found->answer.count.value_or(static_cast<std::uint32_t>(moved));
        found->record->internal = OutcomeMark + code;
        event = found->record->event;
        running.erase(found);
    }
    SignalEvent(event);
}

bool ScriptedDriver::GetResult(Handle, Overlapped& record, std::uint32_t& transferred, bool wait) {
    for (;;) {
        {
            const std::lock_guard held(lock);
            if (record.internal != RunningMark) {
                transferred = static_cast<std::uint32_t>(record.internalHigh);
                const auto code = static_cast<ErrorCode>(record.internal - OutcomeMark);
                SetLastError(code);
                return code == Errors::Success;
            }
        }
        if (!wait) {
            SetLastError(Errors::IoIncomplete);
            return false;
        }
        SleepMilliseconds(1);
    }
}

bool ScriptedDriver::CancelTransfers(Handle handle) {
    std::vector<Transfer> cancelled;
    {
        const std::lock_guard held(lock);
        for (Transfer& transfer : running) {
            if (transfer.file == handle && transfer.starter == std::this_thread::get_id() &&
                !std::exchange(transfer.isCancelled, true)) {
                cancelled.push_back(transfer);
            }
        }
        if (!cancelled.empty()) {
            transcript.push_back("cancel " + std::to_string(cancelled.front().file->pipe));
        }
    }
    for (const Transfer& transfer : cancelled) {
        const Answer& answer = transfer.answer;
        if (answer.cancelledAfter == 0) {
            End(transfer.number, answer.cancelledWith, answer.cancelledWithData);
        } else if (answer.cancelledAfter != Never) {
            // Between two looks of a waiting `GetResult`.
            EndLater(transfer.number, std::uint64_t{answer.cancelledAfter} * 1000 - 500, answer.cancelledWith,
                     answer.cancelledWithData);
        }
    }
    return true;
}

}  // namespace Varnholt::Tests
