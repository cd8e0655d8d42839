#include "LoggedDeviceFiles.h"

#include <fmt/format.h>

#include <algorithm>
#include <mutex>
#include <optional>
#include <span>
#include <utility>

#include "Capture/DescribeRequest.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/Instrument.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"

namespace Varnholt::Cli {
namespace {

namespace Native = Protocol::NativeDriver;
namespace UsbIo = Protocol::UsbIoDriver;

/// The vendor request that a driver's control asks for.
struct VendorRequest {
    std::uint8_t request;
    std::uint16_t value;
    bool isIn;
};

std::optional<VendorRequest> VendorRequestOf(std::uint32_t code, std::span<const std::uint8_t> block) {
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

std::string TextOfFailure(Platform::ErrorCode code) {
    const bool isWanted = code == Platform::Errors::OperationAborted || code == UsbIo::Status::Cancelled;
    return isWanted ? ": cancelled" : fmt::format(": failed with code 0x{:X}", code);
}

}  // namespace

LoggedDeviceFiles::LoggedDeviceFiles(Platform::DeviceFileSystem& underlying, Log tell)
    : below_(underlying), log_(std::move(tell)) {}

std::vector<std::string> LoggedDeviceFiles::ListInterfaces(const Protocol::Guid& interfaceClass) {
    return below_.ListInterfaces(interfaceClass);
}

LoggedDeviceFiles::Handle LoggedDeviceFiles::Open(const std::string& path) {
    const Handle file = below_.Open(path);
    if (file != Platform::InvalidHandle() && Native::SplitPipePath(path).pipe == Native::InterruptPipe) {
        const std::lock_guard holder(section_);
        interruptFiles_.push_back(file);
    }
    return file;
}

bool LoggedDeviceFiles::CloseFile(Handle file) {
    {
        const std::lock_guard holder(section_);
        std::erase(interruptFiles_, file);
        std::erase_if(running_, [file](const auto& transfer) { return transfer.second.file == file; });
    }
    return below_.CloseFile(file);
}

/// The caller finds the last error as it was.
void LoggedDeviceFiles::Ended(const Overlapped& record, std::uint32_t transferred, bool succeeded) {
    const Platform::ErrorCode code = Platform::LastError();
    {
        const std::lock_guard holder(section_);
        if (const auto found = running_.find(&record); found != running_.end()) {
            log_(found->second.describe(transferred) + (succeeded ? "" : TextOfFailure(code)));
            running_.erase(found);
        }
    }
    Platform::SetLastError(code);
}

template <class Start>
bool LoggedDeviceFiles::StartTransfer(Handle file, const Overlapped& record, Description describe,
                                      Start start) {
    {
        // Before the start: its end may be learnt of on another thread.
        const std::lock_guard holder(section_);
        running_[&record] = {file, std::move(describe)};
    }
    const bool completed = start();
    if (!completed && Platform::LastError() != Platform::Errors::IoPending) {
        Ended(record, 0, false);
    }
    return completed;
}

bool LoggedDeviceFiles::StartRead(Handle file, void* buffer, std::uint32_t length, Overlapped& record) {
    bool isInterrupt = false;
    {
        const std::lock_guard holder(section_);
        isInterrupt = std::ranges::find(interruptFiles_, file) != interruptFiles_.end();
    }
    return StartTransfer(
        file, record,
        [isInterrupt, length](std::uint32_t transferred) {
            return Capture::DescribeData(
                isInterrupt ? Protocol::InterruptInEndpoint : Protocol::BulkInEndpoint, transferred, length);
        },
        [&] { return below_.StartRead(file, buffer, length, record); });
}

bool LoggedDeviceFiles::StartWrite(Handle file, const void* buffer, std::uint32_t length,
                                   Overlapped& record) {
    return StartTransfer(
        file, record,
        [length](std::uint32_t transferred) {
            return Capture::DescribeData(Protocol::BulkOutEndpoint, transferred, length);
        },
        [&] { return below_.StartWrite(file, buffer, length, record); });
}

bool LoggedDeviceFiles::StartControl(Handle file, std::uint32_t code, const void* input,
                                     std::uint32_t inputSize, void* output, std::uint32_t outputSize,
                                     Overlapped& record) {
    const auto* const block = static_cast<const std::uint8_t*>(input);
    const auto start = [&] {
        return below_.StartControl(file, code, input, inputSize, output, outputSize, record);
    };
    if (code == UsbIo::Control::BindPipe && inputSize > 0 && *block == Protocol::InterruptInEndpoint) {
        const std::lock_guard holder(section_);
        interruptFiles_.push_back(file);
    }
    const std::optional<VendorRequest> request = VendorRequestOf(code, {block, inputSize});
    if (!request) {
        return start();
    }
    return StartTransfer(
        file, record,
        [request = *request, data = static_cast<const std::uint8_t*>(output),
         outputSize](std::uint32_t transferred) {
            const std::uint32_t known = request.isIn ? std::min(transferred, outputSize) : outputSize;
            return Capture::DescribeRequest(request.request, request.value, {data, known});
        },
        start);
}

bool LoggedDeviceFiles::GetResult(Handle file, Overlapped& record, std::uint32_t& transferred, bool wait) {
    const bool succeeded = below_.GetResult(file, record, transferred, wait);
    if (succeeded || Platform::LastError() != Platform::Errors::IoIncomplete) {
        Ended(record, transferred, succeeded);
    }
    return succeeded;
}

bool LoggedDeviceFiles::CancelTransfers(Handle file) {
    return below_.CancelTransfers(file);
}

}  // namespace Varnholt::Cli
