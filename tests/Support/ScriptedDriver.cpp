#include "Support/ScriptedDriver.h"

#include <algorithm>
#include <cstdio>
#include <span>
#include <utility>

#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Tests {

using namespace Platform;
namespace UsbIoControl = Protocol::UsbIoDriver::Control;

namespace {

// What `Overlapped::internal` holds.
constexpr std::uintptr_t RunningMark = 0x103;
constexpr std::uintptr_t EndedMark = 0x104;

bool IsNative(const std::string& path) {
    return path.starts_with("native/");
}

std::string Line(const char* what, std::uint32_t number) {
    char text[32];
    std::snprintf(text, sizeof text, "%s %X", what, number);
    return text;
}
std::string Sent(std::span<const std::uint8_t> bytes) {
    return bytes.empty() ? "" : " " + Hex(bytes.data(), bytes.size());
}
std::string Room(std::uint32_t bytes) {
    return " [" + std::to_string(bytes) + "]";
}

Answer UsualAnswer(std::uint32_t code, std::uint32_t room) {
    switch (code) {
        case UsbIoControl::GetDriverInfo:
            return {.data = {0x30, 0x02, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0}};
        case UsbIoControl::GetDeviceParameters:
            return {.data = {0x11, 0, 0, 0, 0x22, 0, 0, 0}};
        default:
            return {.data = Bytes(room)};
    }
}

}  // namespace

ScriptedDriver::ScriptedDriver(std::vector<std::string> devicePaths) : paths_(std::move(devicePaths)) {}

ScriptedDriver::~ScriptedDriver() {
    ClockScheduler().Forget(this);
}

void ScriptedDriver::Script(std::uint32_t place, Answer answer) {
    const std::lock_guard held(lock_);
    scripts_[place].push_back(std::move(answer));
}

void ScriptedDriver::DropScript(std::uint32_t place) {
    const std::lock_guard held(lock_);
    scripts_[place].clear();
}

void ScriptedDriver::OnOpen(const std::string& path, std::function<ErrorCode()> action) {
    const std::lock_guard held(lock_);
    openActions_[path] = std::move(action);
}

bool ScriptedDriver::Complete(std::uint32_t place, const Answer& answer) {
    std::uint64_t number = 0;
    {
        const std::lock_guard held(lock_);
        const auto oldest = std::ranges::find(running_, place, &Transfer::place);
        if (oldest == running_.end()) {
            return false;
        }
        oldest->answer = answer;
        number = oldest->number;
    }
    End(number, answer.code, true);
    return true;
}

std::vector<std::string> ScriptedDriver::TakeTranscript() {
    const std::lock_guard held(lock_);
    return std::exchange(transcript_, {});
}

std::vector<std::string> ScriptedDriver::TakeTransfers() {
    std::vector<std::string> lines = TakeTranscript();
    std::erase_if(
        lines, [](const std::string& line) { return line.starts_with("open") || line.starts_with("close"); });
    return lines;
}

std::size_t ScriptedDriver::OpenFiles() const {
    const std::lock_guard held(lock_);
    return static_cast<std::size_t>(
        std::ranges::count_if(files_, [](const auto& file) { return file->isOpen; }));
}

std::size_t ScriptedDriver::Running(std::optional<std::uint32_t> place) const {
    const std::lock_guard held(lock_);
    return place ? static_cast<std::size_t>(std::ranges::count(running_, *place, &Transfer::place))
                 : running_.size();
}

std::vector<std::string> ScriptedDriver::ListInterfaces(const Protocol::Guid& interfaceClass) {
    std::vector<std::string> listed;
    std::ranges::copy_if(paths_, std::back_inserter(listed), [&](const std::string& path) {
        return interfaceClass == (IsNative(path) ? Protocol::NativeDriver::InterfaceClass
                                                 : Protocol::UsbIoDriver::InterfaceClass);
    });
    return listed;
}

Handle ScriptedDriver::Open(const std::string& path) {
    const auto action = [&] {
        const std::lock_guard held(lock_);
        return openActions_[path];
    }();
    if (const ErrorCode refusal = action ? action() : Errors::Success; refusal != Errors::Success) {
        SetLastError(refusal);
        return InvalidHandle();
    }
    const std::lock_guard held(lock_);
    transcript_.push_back("open " + path);
    files_.push_back(std::make_unique<File>(File{path, Protocol::NativeDriver::SplitPipePath(path).pipe}));
    return files_.back().get();
}

ScriptedDriver::File* ScriptedDriver::Find(Handle handle) {
    const std::lock_guard held(lock_);
    const auto found = std::ranges::find_if(
        files_, [handle](const auto& file) { return file.get() == handle && file->isOpen; });
    if (found == files_.end()) {
        SetLastError(Errors::InvalidHandle);
        return nullptr;
    }
    return found->get();
}

bool ScriptedDriver::CloseFile(Handle handle) {
    File* const file = Find(handle);
    if (!file) {
        return false;
    }
    {
        const std::lock_guard held(lock_);
        file->isOpen = false;
        transcript_.push_back("close " + file->path);
    }
    EndAll(*file);
    return true;
}

bool ScriptedDriver::Start(Handle handle, const Operation& operation, Overlapped& record) {
    File* const file = Find(handle);
    if (!file) {
        return false;
    }
    if (operation.kind == Operation::Kind::Control) {
        return Control(*file, operation, record);
    }
    const auto& [kind, data, length, code, input] = operation;
    return kind == Operation::Kind::Read
               ? Begin(*file, operation, Line("read", file->place) + Room(length), data, {.after = Never},
                       record)
               : Begin(*file, operation, Line("write", file->place) + Sent({data, length}), nullptr, {},
                       record);
}

bool ScriptedDriver::Control(File& file, const Operation& operation, Overlapped& record) {
    const auto& [kind, data, length, code, input] = operation;
    const bool isInward = IsNative(file.path) ? input[Protocol::NativeDriver::Block::Direction] != 0
                                              : length > 0 && code != UsbIoControl::ClassOrVendorOutRequest;
    const bool completed =
        Begin(file, operation,
              Line("control", code) + Sent(input) + " /" + (isInward ? Room(length) : Sent({data, length})),
              isInward ? data : nullptr, UsualAnswer(code, length), record);
    if (completed && code == UsbIoControl::BindPipe) {
        file.place = input[0];
    }
    if (completed && code == UsbIoControl::AbortPipe) {
        EndAll(file);
    }
    return completed;
}

Answer ScriptedDriver::TakeAnswer(std::uint32_t place, std::uint32_t code, const Answer& usual) {
    const std::lock_guard held(lock_);
    for (const std::uint32_t key : {code == 0 ? place : code, place}) {
        if (std::deque<Answer>& script = scripts_[key]; !script.empty()) {
            Answer answer = std::move(script.front());
            script.pop_front();
            return answer;
        }
    }
    return usual;
}

bool ScriptedDriver::Begin(const File& file, const Operation& operation, std::string line,
                           std::uint8_t* target, const Answer& usual, Overlapped& record) {
    const std::uint32_t place = operation.kind == Operation::Kind::Control ? 0 : file.place;
    {
        const std::lock_guard held(lock_);
        transcript_.push_back(std::move(line));
    }
    const Answer answer = TakeAnswer(place, operation.code, usual);
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
        const std::lock_guard held(lock_);
        number = ++lastNumber_;
        record.internal = RunningMark;
        record.internalHigh = 0;
        running_.push_back(
            {number, &file, place, &record, target, operation.length, std::this_thread::get_id(), answer});
    }
    if (answer.after == 0) {
        End(number, answer.code, true);
    } else if (answer.after != Never) {
        EndLater(number, std::uint64_t{answer.after} * 1000, answer.code, true);
    }
    const bool completed = answer.after == 0 && answer.code == Errors::Success;
    SetLastError(completed ? Errors::Success : Errors::IoPending);
    return completed;
}

void ScriptedDriver::EndLater(std::uint64_t number, std::uint64_t microseconds, ErrorCode code,
                              bool withData) {
    const auto end = [this, number, code, withData] { End(number, code, withData); };
    ClockScheduler().CallAt(ClockScheduler().Now() + microseconds, end, this);
}

void ScriptedDriver::End(std::uint64_t number, ErrorCode code, bool withData) {
    Handle event = NoHandle;
    {
        const std::lock_guard held(lock_);
        const auto found = std::ranges::find(running_, number, &Transfer::number);
        if (found == running_.end()) {
            return;
        }
        std::size_t moved = withData ? found->length : 0;
        if (found->target) {
            moved = std::min(moved, found->answer.data.size());
            std::copy_n(found->answer.data.begin(), moved, found->target);
        }
        found->record->internalHigh = found->answer.count.value_or(static_cast<std::uint32_t>(moved));
        found->record->offset = code;
        found->record->internal = EndedMark;
        event = found->record->event;
        running_.erase(found);
    }
    SignalEvent(event);
}

void ScriptedDriver::EndAll(const File& file) {
    std::vector<std::uint64_t> numbers;
    {
        const std::lock_guard held(lock_);
        for (const Transfer& transfer : running_) {
            if (transfer.file == &file) {
                numbers.push_back(transfer.number);
            }
        }
    }
    for (const std::uint64_t number : numbers) {
        End(number, Errors::OperationAborted, false);
    }
}

bool ScriptedDriver::GetResult(Handle, Overlapped& record, std::uint32_t& transferred, bool wait) {
    for (;;) {
        {
            const std::lock_guard held(lock_);
            if (record.internal != RunningMark) {
                const bool hasEnded = record.internal == EndedMark;  // and not: was never started
                transferred = static_cast<std::uint32_t>(record.internalHigh);
                const ErrorCode code = hasEnded ? record.offset : Errors::InvalidParameter;
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
        const std::lock_guard held(lock_);
        for (Transfer& transfer : running_) {
            if (transfer.file == handle && transfer.starter == std::this_thread::get_id() &&
                !std::exchange(transfer.isCancelled, true)) {
                cancelled.push_back(transfer);
            }
        }
        if (!cancelled.empty()) {
            transcript_.push_back(Line("cancel", cancelled.front().place));
        }
    }
    for (const Transfer& transfer : cancelled) {
        const Answer& answer = transfer.answer;
        if (answer.cancelledAfter == 0) {
            End(transfer.number, Errors::OperationAborted, answer.cancelledWithData);
        } else if (answer.cancelledAfter != Never) {
            // Between two looks of a waiting `GetResult`.
            EndLater(transfer.number, std::uint64_t{answer.cancelledAfter} * 1000 - 500,
                     Errors::OperationAborted, answer.cancelledWithData);
        }
    }
    return true;
}

}  // namespace Varnholt::Tests
