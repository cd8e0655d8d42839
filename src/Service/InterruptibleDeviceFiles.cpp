#include "Service/InterruptibleDeviceFiles.h"

#include <fmt/format.h>

#include <algorithm>
#include <mutex>
#include <new>
#include <optional>
#include <span>
#include <utility>

#include "Capture/DescribeRequest.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/Instrument.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Service {

using namespace Platform;

namespace Native = Protocol::NativeDriver;

namespace {

constexpr std::uint32_t AbortLimit = 2000;  // milliseconds

/// The vendor request that a driver's control asks for.
struct VendorRequest {
    std::uint8_t request;
    std::uint16_t value;
    bool isIn;
};

std::optional<VendorRequest> VendorRequestOf(std::uint32_t code, std::span<const std::uint8_t> block) {
    namespace UsbIo = Protocol::UsbIoDriver;
    switch (code) {
        case Native::ControlVendorRequest:
        case Native::ControlButtonReport:
            if (block.size() < Native::ControlBlockSize) {
                break;
            }
            return VendorRequest{block[Native::Block::Request],
                                 Protocol::LoadLittle16(&block[Native::Block::Value]),
                                 block[Native::Block::Direction] == Native::DirectionIn};
        case UsbIo::Control::ClassOrVendorInRequest:
        case UsbIo::Control::ClassOrVendorOutRequest:
            if (block.size() < UsbIo::RequestBlock::Size) {
                break;
            }
            return VendorRequest{block[UsbIo::RequestBlock::Request],
                                 Protocol::LoadLittle16(&block[UsbIo::RequestBlock::Value]),
                                 code == UsbIo::Control::ClassOrVendorInRequest};
        default:
            break;
    }
    return std::nullopt;
}

std::string TextOfFailure(ErrorCode code) {
    const bool isWanted =
        code == Errors::OperationAborted || code == Protocol::UsbIoDriver::Status::Cancelled;
    return isWanted ? ": cancelled" : fmt::format(": failed with code 0x{:X}", code);
}

}  // namespace

InterruptibleDeviceFiles::InterruptibleDeviceFiles(DeviceFileSystem& underlying, Log tell)
    : below_(underlying), log_(std::move(tell)) {}

void InterruptibleDeviceFiles::Interrupt(const std::string& device) {
    const std::lock_guard holder(section_);
    interrupted_.push_back(device);
    for (const OpenedFile& file : files_) {
        const bool isBusy = std::ranges::any_of(running_, [&file](const auto& transfer) {
            return transfer.second.isOnPipe && transfer.second.file == file.handle;
        });
        if (isBusy && IsInterrupted(file.handle)) {
            AbortPipe(file);
        }
    }
}

void InterruptibleDeviceFiles::Resume(const std::string& device) {
    const std::lock_guard holder(section_);
    std::erase(interrupted_, device);
}

InterruptibleDeviceFiles::OpenedFile* InterruptibleDeviceFiles::Find(Handle file) {
    const auto found = std::ranges::find(files_, file, &OpenedFile::handle);
    return found == files_.end() ? nullptr : &*found;
}

bool InterruptibleDeviceFiles::IsInterrupted(Handle file) {
    if (interrupted_.empty()) {
        return false;
    }
    const OpenedFile* const opened = Find(file);
    return opened != nullptr && !opened->waitsForButton &&
           std::ranges::any_of(interrupted_, [opened](const std::string& device) {
               return device.empty() || opened->device == device;
           });
}

void InterruptibleDeviceFiles::AbortPipe(const OpenedFile& file) {
    if (file.pipe == Native::ControlPipe) {
        Control(file.handle, Protocol::UsbIoDriver::Control::AbortPipe, {});
        return;
    }
    const auto owner = std::ranges::find_if(files_, [&file](const OpenedFile& other) {
        return other.device == file.device && other.pipe == Native::ControlPipe;
    });
    if (owner == files_.end()) {
        return;
    }
    Native::ControlBlock block{};
    Protocol::StoreLittle16(&block[Native::Block::Value], file.pipe == Native::ReadPipe
                                                              ? Protocol::BulkInEndpoint
                                                              : Protocol::BulkOutEndpoint);
    Control(owner->handle, Native::ControlAbortPipe, block);
}

/// Failures do not matter: whoever waits for the transfers still has limits of his own.
void InterruptibleDeviceFiles::Control(Handle file, std::uint32_t code, std::span<const std::uint8_t> block) {
    const OwnedHandle event(MakeAutoResetEvent());
    if (!event) {
        return;
    }
    Overlapped record;
    record.event = event.Get();
    if (below_.Start(file, Operation::Control(code, block, nullptr, 0), record) ||
        LastError() != Errors::IoPending) {
        return;
    }
    Wait(event.Get(), AbortLimit);
    std::uint32_t transferred = 0;
    if (!below_.GetResult(file, record, transferred, false) && LastError() == Errors::IoIncomplete) {
        below_.CancelTransfers(file);
        below_.GetResult(file, record, transferred, true);
    }
}

std::vector<std::string> InterruptibleDeviceFiles::ListInterfaces(const Protocol::Guid& interfaceClass) {
    return below_.ListInterfaces(interfaceClass);
}

Handle InterruptibleDeviceFiles::Open(const std::string& path) {
    const Handle file = below_.Open(path);
    if (file == InvalidHandle()) {
        return file;
    }
    try {
        const auto [device, pipe] = Native::SplitPipePath(path);
        const std::lock_guard holder(section_);
        files_.push_back({file, std::string(device), pipe, pipe == Native::InterruptPipe});
        return file;
    } catch (const std::bad_alloc&) {
        below_.CloseFile(file);
        SetLastError(Errors::NotEnoughMemory);
        return InvalidHandle();
    }
}

bool InterruptibleDeviceFiles::CloseFile(Handle file) {
    {
        const std::lock_guard holder(section_);
        std::erase_if(files_, [file](const OpenedFile& opened) { return opened.handle == file; });
        std::erase_if(running_, [file](const auto& transfer) { return transfer.second.file == file; });
    }
    return below_.CloseFile(file);
}

bool InterruptibleDeviceFiles::Refuse(const Overlapped& record, ErrorCode code) {
    if (record.event != NoHandle) {
        SignalEvent(record.event);
    }
    SetLastError(code);
    return false;
}

/// The caller finds the last error as it was.
void InterruptibleDeviceFiles::Ended(const Overlapped& record, std::uint32_t transferred, bool succeeded) {
    const ErrorCode code = LastError();
    Description describe;
    {
        const std::lock_guard holder(section_);
        if (const auto found = running_.find(&record); found != running_.end()) {
            describe = std::move(found->second.describe);
            running_.erase(found);
        }
    }
    if (describe) {  // without the section, for which an interruption would have to wait
        const std::lock_guard holder(telling_);
        log_(describe(transferred) + (succeeded ? "" : TextOfFailure(code)));
    }
    SetLastError(code);
}

/// How the operation's end is told; empty where it is told nobody.
InterruptibleDeviceFiles::Description InterruptibleDeviceFiles::DescriptionOf(
    const OpenedFile* opened, const Operation& operation) const {
    if (!log_) {
        return {};
    }
    const std::uint32_t length = operation.length;
    if (operation.kind == Operation::Kind::Control) {
        const auto request = VendorRequestOf(operation.code, operation.input);
        if (!request) {
            return {};
        }
        return [request = *request, data = operation.data, length](std::uint32_t transferred) {
            const std::uint32_t known = request.isIn ? std::min(transferred, length) : length;
            return Capture::DescribeRequest(request.request, request.value, {data, known});
        };
    }
    std::uint8_t endpoint =
        operation.kind == Operation::Kind::Read ? Protocol::BulkInEndpoint : Protocol::BulkOutEndpoint;
    if (opened != nullptr && opened->waitsForButton) {
        endpoint = Protocol::InterruptInEndpoint;
    }
    return [endpoint, length](std::uint32_t transferred) {
        return Capture::DescribeData(endpoint, transferred, length);
    };
}

/// The section is held over the start of a read or write, so that none slips in behind an interruption. A
/// control is short and has no pipe that could be aborted; it ends by itself. Each is noted before its start:
/// its end may be learnt of on another thread.
bool InterruptibleDeviceFiles::Start(Handle file, const Operation& operation, Overlapped& record) try {
    std::unique_lock holder(section_);
    if (IsInterrupted(file)) {
        return Refuse(record, Errors::OperationAborted);
    }
    const bool isControl = operation.kind == Operation::Kind::Control;
    OpenedFile* const opened = Find(file);
    running_[&record] = {file, !isControl, DescriptionOf(opened, operation)};
    if (isControl) {
        if (opened != nullptr && operation.code == Protocol::UsbIoDriver::Control::BindPipe &&
            !operation.input.empty()) {
            opened->waitsForButton = operation.input.front() == Protocol::InterruptInEndpoint;
        }
        holder.unlock();
    }
    const bool completed = below_.Start(file, operation, record);
    if (!completed && LastError() != Errors::IoPending) {
        Ended(record, 0, false);
    }
    return completed;
} catch (const std::bad_alloc&) {
    return Refuse(record, Errors::NotEnoughMemory);
}

bool InterruptibleDeviceFiles::GetResult(Handle file, Overlapped& record, std::uint32_t& transferred,
                                         bool wait) {
    const bool succeeded = below_.GetResult(file, record, transferred, wait);
    if (succeeded || LastError() != Errors::IoIncomplete) {
        Ended(record, transferred, succeeded);
    }
    return succeeded;
}

bool InterruptibleDeviceFiles::CancelTransfers(Handle file) {
    return below_.CancelTransfers(file);
}

}  // namespace Varnholt::Service
