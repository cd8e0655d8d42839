#include "Support/ScriptedUsbIo.h"

#include <algorithm>
#include <cstdio>
#include <utility>

#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Tests {

using namespace Platform;
namespace Control = Protocol::UsbIoDriver::Control;

namespace {

// What `Overlapped::internal` holds.
constexpr std::uintptr_t RunningMark = 0x103;
constexpr std::uintptr_t EndedMark = 0x104;

/// Upper case, with leading zeros.
std::string HexNumber(std::uint32_t number, int digits) {
    char text[16];
    std::snprintf(text, sizeof text, "%0*X", digits, number);
    return text;
}
std::string Room(std::uint32_t bytes) {
    return " [" + std::to_string(bytes) + "]";
}
std::string Name(std::uint8_t endpoint) {
    return HexNumber(endpoint, 2);
}

std::string Hex(const void* bytes, std::uint32_t size) {
    const auto* const first = static_cast<const std::uint8_t*>(bytes);
    std::string text;
    for (std::uint32_t i = 0; i < size; ++i) {
        text += " " + HexNumber(first[i], 2);
    }
    return text;
}

UsbIoAnswer UsualAnswer(std::uint32_t code, std::uint32_t room) {
    switch (code) {
        case Control::GetDriverInfo:
            return {.data = {0x30, 0x02, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0}};
        case Control::GetDeviceParameters:
            return {.data = {0x11, 0, 0, 0, 0x22, 0, 0, 0}};
        default:
            return {.data = std::vector<std::uint8_t>(room)};
    }
}

}  // namespace

ScriptedUsbIo::ScriptedUsbIo(std::vector<std::string> devicePaths) : paths(std::move(devicePaths)) {}

ScriptedUsbIo::~ScriptedUsbIo() {
    for (const EventScheduler::EventId event : events) {
        ClockScheduler().Forget(event);
    }
}

void ScriptedUsbIo::ScriptControl(std::uint32_t code, UsbIoAnswer answer) {
    const std::lock_guard held(lock);
    answers[code].push_back(std::move(answer));
}

void ScriptedUsbIo::Script(std::uint8_t endpoint, UsbIoAnswer answer) {
    const std::lock_guard held(lock);
    answers[endpoint].push_back(std::move(answer));
}

void ScriptedUsbIo::RefuseOpen(const std::string& path, ErrorCode code) {
    const std::lock_guard held(lock);
    refusals[path] = code;
}

bool ScriptedUsbIo::Complete(std::uint8_t endpoint) {
    std::uint64_t number = 0;
    ErrorCode code = Errors::Success;
    {
        const std::lock_guard held(lock);
        const auto oldest =
            std::find_if(running.begin(), running.end(), [endpoint](const Transfer& transfer) {
                return !transfer.isControl && transfer.file->endpoint == endpoint;
            });
        if (oldest == running.end()) {
            return false;
        }
        number = oldest->number;
        code = oldest->answer.code;
    }
    End(number, code, true);
    return true;
}

std::vector<std::string> ScriptedUsbIo::TakeTranscript() {
    const std::lock_guard held(lock);
    return std::exchange(transcript, {});
}

std::size_t ScriptedUsbIo::OpenFiles() const {
    const std::lock_guard held(lock);
    return static_cast<std::size_t>(
        std::count_if(files.begin(), files.end(), [](const auto& file) { return file->isOpen; }));
}

std::size_t ScriptedUsbIo::Running(std::uint8_t endpoint) const {
    const std::lock_guard held(lock);
    return static_cast<std::size_t>(
        std::count_if(running.begin(), running.end(), [endpoint](const Transfer& transfer) {
            return !transfer.isControl && transfer.file->endpoint == endpoint;
        }));
}

std::uint64_t ScriptedUsbIo::BytesIn(std::uint8_t endpoint) const {
    const std::lock_guard held(lock);
    const auto found = bytesIn.find(endpoint);
    return found == bytesIn.end() ? 0 : found->second;
}

std::size_t ScriptedUsbIo::MostControlsAtOnce() const {
    const std::lock_guard held(lock);
    return mostControls;
}

std::vector<std::string> ScriptedUsbIo::ListInterfaces(const Protocol::Guid& interfaceClass) {
    return interfaceClass == Protocol::UsbIoDriver::InterfaceClass ? paths : std::vector<std::string>();
}

Handle ScriptedUsbIo::Open(const std::string& path) {
    ErrorCode refusal = Errors::Success;
    {
        const std::lock_guard held(lock);
        const auto refused = refusals.find(path);
        if (refused == refusals.end()) {
            transcript.push_back("open " + path);
            files.push_back(std::make_unique<File>(File{path}));
            return files.back().get();
        }
        refusal = refused->second;
    }
    SetLastError(refusal);
    return InvalidHandle();
}

ScriptedUsbIo::File* ScriptedUsbIo::Find(Handle handle) {
    const std::lock_guard held(lock);
    for (const std::unique_ptr<File>& file : files) {
        if (file.get() == handle && file->isOpen) {
            return file.get();
        }
    }
    SetLastError(Errors::InvalidHandle);
    return nullptr;
}

bool ScriptedUsbIo::CloseFile(Handle handle) {
    File* const file = Find(handle);
    if (!file) {
        return false;
    }
    {
        const std::lock_guard held(lock);
        file->isOpen = false;
        transcript.push_back("close " + file->path);
    }
    EndAll(*file);
    return true;
}

bool ScriptedUsbIo::StartRead(Handle handle, void* buffer, std::uint32_t length, Overlapped& record) {
    const File* const file = Find(handle);
    return file && Start(*file, false, "read " + Name(file->endpoint) + Room(length),
                         static_cast<std::uint8_t*>(buffer), length, file->endpoint,
                         {.after = UsbIoAnswer::Never}, record);
}

bool ScriptedUsbIo::StartWrite(Handle handle, const void* buffer, std::uint32_t length, Overlapped& record) {
    const File* const file = Find(handle);
    return file && Start(*file, false, "write " + Name(file->endpoint) + Hex(buffer, length), nullptr, length,
                         file->endpoint, {}, record);
}

bool ScriptedUsbIo::StartControl(Handle handle, std::uint32_t code, const void* input,
                                 std::uint32_t inputSize, void* output, std::uint32_t outputSize,
                                 Overlapped& record) {
    File* const file = Find(handle);
    if (!file) {
        return false;
    }
    const bool isInward = outputSize > 0 && code != Control::ClassOrVendorOutRequest;
    const std::string line = "control " + HexNumber(code, 8) + Hex(input, inputSize) + " /" +
                             (isInward ? Room(outputSize) : Hex(output, outputSize));
    const bool completed = Start(*file, true, line, isInward ? static_cast<std::uint8_t*>(output) : nullptr,
                                 outputSize, code, UsualAnswer(code, outputSize), record);
    if (completed && code == Control::BindPipe) {
        file->endpoint = *static_cast<const std::uint8_t*>(input);
    }
    if (completed && code == Control::AbortPipe) {
        EndAll(*file);
    }
    return completed;
}

bool ScriptedUsbIo::Start(const File& file, bool isControl, std::string line, std::uint8_t* target,
                          std::uint32_t length, std::uint32_t scriptKey, const UsbIoAnswer& usual,
                          Overlapped& record) {
    UsbIoAnswer answer = usual;
    {
        const std::lock_guard held(lock);
        transcript.push_back(std::move(line));
        if (std::deque<UsbIoAnswer>& script = answers[scriptKey]; !script.empty()) {
            answer = std::move(script.front());
            script.pop_front();
        }
    }
    if (answer.onStart) {
        answer.onStart();
    }
    if (answer.refused) {
        SetLastError(answer.code);
        return false;
    }
    Wait(record.event, 0);  // resets it
    std::uint64_t number = 0;
    {
        const std::lock_guard held(lock);
        number = ++lastNumber;
        record.internal = RunningMark;
        running.push_back(
            {number, &file, isControl, &record, target, length, std::this_thread::get_id(), answer});
        const auto controls = std::count_if(running.begin(), running.end(),
                                            [](const Transfer& transfer) { return transfer.isControl; });
        mostControls = std::max(mostControls, static_cast<std::size_t>(controls));
    }
    if (answer.after == 0) {
        End(number, answer.code, true);
    } else {
        EndLater(number, answer.after, answer.code, true);
    }
    const bool completed = answer.after == 0 && answer.code == Errors::Success;
    SetLastError(completed ? Errors::Success : Errors::IoPending);
    return completed;
}

void ScriptedUsbIo::EndLater(std::uint64_t number, std::uint32_t after, ErrorCode code, bool withData) {
    if (after == UsbIoAnswer::Never) {
        return;
    }
    const EventScheduler::EventId event =
        ClockScheduler().CallAt(ClockScheduler().Now() + std::uint64_t{after} * 1000,
                                [this, number, code, withData] { End(number, code, withData); });
    const std::lock_guard held(lock);
    events.push_back(event);
}

void ScriptedUsbIo::End(std::uint64_t number, ErrorCode code, bool withData) {
    Handle event = NoHandle;
    {
        const std::lock_guard held(lock);
        const auto found = std::find_if(running.begin(), running.end(), [number](const Transfer& transfer) {
            return transfer.number == number;
        });
        if (found == running.end()) {
            return;
        }
        std::size_t moved = withData ? found->length : 0;
        if (found->target) {
            moved = std::min(moved, found->answer.data.size());
            std::copy_n(found->answer.data.begin(), moved, found->target);
            bytesIn[found->file->endpoint] += found->isControl ? 0 : moved;
        }
        found->record->internalHigh = found->answer.reportedCount.value_or(static_cast<std::uint32_t>(moved));
        found->record->offset = code;
        found->record->internal = EndedMark;
        event = found->record->event;
        running.erase(found);
    }
    SignalEvent(event);
}

void ScriptedUsbIo::EndAll(const File& file) {
    std::vector<std::uint64_t> numbers;
    {
        const std::lock_guard held(lock);
        for (const Transfer& transfer : running) {
            if (transfer.file == &file) {
                numbers.push_back(transfer.number);
            }
        }
    }
    for (const std::uint64_t number : numbers) {
        End(number, Errors::OperationAborted, false);
    }
}

bool ScriptedUsbIo::GetResult(Handle, Overlapped& record, std::uint32_t& transferred, bool wait) {
    for (;;) {
        {
            const std::lock_guard held(lock);
            if (record.internal == EndedMark) {
                transferred = static_cast<std::uint32_t>(record.internalHigh);
                SetLastError(record.offset);
                return record.offset == Errors::Success;
            }
        }
        if (!wait) {
            SetLastError(Errors::IoIncomplete);
            return false;
        }
        SleepMilliseconds(1);
    }
}

bool ScriptedUsbIo::CancelTransfers(Handle handle) {
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
            transcript.push_back("cancel " + Name(cancelled.front().file->endpoint));
        }
    }
    for (const Transfer& transfer : cancelled) {
        const UsbIoAnswer& answer = transfer.answer;
        if (answer.cancelledAfter == 0) {
            End(transfer.number, answer.cancelledCode, answer.cancelledWithData);
        } else {
            EndLater(transfer.number, answer.cancelledAfter, answer.cancelledCode, answer.cancelledWithData);
        }
    }
    return true;
}

}  // namespace Varnholt::Tests
