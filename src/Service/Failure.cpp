#include "Service/Failure.h"

#include <fmt/format.h>

#include <array>
#include <new>
#include <string_view>
#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Platform/ErrorCodes.h"
#include "Protocol/UsbIoDriver.h"
#include "Service/SystemAdvice.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Files/FileError.h"

namespace Varnholt::Service {
namespace {

namespace Errors = Platform::Errors;
namespace Status = Protocol::UsbIoDriver::Status;

struct CodeMeaning {
    std::uint32_t code;
    FailureKind kind;
    const char* message;
    const char* advice;
};

constexpr const char* UnpluggedMessage = "the instrument is not there any more";
constexpr const char* UnpluggedAdvice = "plug it in again; `ostra list` shows whether it is found";
constexpr const char* InUseMessage = "the instrument is used by another process";
constexpr const char* InUseAdvice = "end the other program: an instrument belongs to one process at a time";
constexpr const char* NoPermissionMessage = "no permission to open the instrument";
constexpr const char* NoPermissionAdvice = "`ostra doctor` names the reason and the fix";
constexpr const char* SilentMessage = "the instrument did not answer in time";
constexpr const char* SilentAdvice = "unplug it and plug it in again, then try once more";
constexpr const char* TransferAdvice = "try again; if it stays, `ostra doctor`";
constexpr std::uint32_t AcquiredExclusively = 0xE0001020;
constexpr std::uint32_t BusTimeout = 0xE0006000;

constexpr std::array Meanings{
    CodeMeaning{Errors::Busy, FailureKind::InUse, InUseMessage, InUseAdvice},
    CodeMeaning{Status::OpenedByOtherProcess, FailureKind::InUse, InUseMessage, InUseAdvice},
    CodeMeaning{AcquiredExclusively, FailureKind::InUse, InUseMessage, InUseAdvice},
    CodeMeaning{Errors::AccessDenied, FailureKind::NoPermission, NoPermissionMessage, NoPermissionAdvice},
    CodeMeaning{Errors::FileNotFound, FailureKind::Unplugged, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Errors::DeviceNotConnected, FailureKind::Unplugged, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Status::DeviceRemoved, FailureKind::Unplugged, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Status::DeviceGone, FailureKind::Unplugged, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Status::DeviceNotFound, FailureKind::Unplugged, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Errors::IoIncomplete, FailureKind::Timeout, SilentMessage, SilentAdvice},
    CodeMeaning{Errors::SemaphoreTimeout, FailureKind::Timeout, SilentMessage, SilentAdvice},
    CodeMeaning{Status::TimedOut, FailureKind::Timeout, SilentMessage, SilentAdvice},
    CodeMeaning{BusTimeout, FailureKind::Timeout, SilentMessage, SilentAdvice},
};

/// The library's text for a lock that the system did not make.
constexpr std::string_view MissingLockText = "handle is NULL";

std::string Tidy(std::string text) {
    // A Windows system text ends with a line break of its own.
    std::erase_if(text, [](char c) { return c == '\r' || c == '\n'; });
    return text;
}

std::string WithReason(const char* message, const std::string& reason) {
    return reason.empty() ? message : std::string(message) + " (" + reason + ")";
}

Failure OfTransfer(const DeviceDriver::Generic::Utilities::DeviceDriverException& exception) {
    const std::string text = Tidy(exception.what());
    for (const CodeMeaning& meaning : Meanings) {
        if (exception.Code() == meaning.code) {
            return {meaning.kind, WithReason(meaning.message, text), meaning.advice, text};
        }
    }
    if (const auto missing = exception.MissingData()) {
        const std::string counts = fmt::format("{} of {} bytes came", missing->moved, missing->asked);
        return {FailureKind::ShortData, text == counts ? counts : WithReason(counts.c_str(), text),
                TransferAdvice, text};
    }
    return {FailureKind::TransferFailed, WithReason("a transfer failed", text), TransferAdvice, text};
}

Failure OfLibrary(FailureKind kind, const Utilities::Exceptions::TraceableException& exception) {
    const std::string text = Tidy(exception.what());
    return {kind, text, {}, text};
}

}  // namespace

Failure::Failure(FailureKind failureKind, std::string message, std::string wayOut, std::string libraryText)
    : kind_(failureKind),
      text_(message),
      message_(std::move(message)),
      advice_(std::move(wayOut)),
      driverText_(std::move(libraryText)) {}

Failure Failure::With(std::string Failure::*part, const std::string& value) const {
    Failure failure = *this;
    failure.*part = value;
    failure.text_ = (failure.instrument_.empty() ? "" : failure.instrument_ + ": ") + failure.message_;
    return failure;
}

bool Failure::IsOfTransfer() const {
    return kind_ == FailureKind::TransferFailed || kind_ == FailureKind::ShortData;
}

Failure Describe(const std::exception_ptr& exception) {
    using namespace DeviceDriver::Generic::Utilities;
    try {
        std::rethrow_exception(exception);
    } catch (const Failure& failure) {
        return failure;
    } catch (const Utilities::Files::FileError& error) {
        return {FailureKind::File, error.what(), error.Advice()};
    } catch (const TimeoutException& error) {
        // A transfer that a removed instrument cannot even begin is reported as a wait that failed.
        const Failure failure = OfTransfer(error);
        return failure.IsOfTransfer()
                   ? Failure(FailureKind::Timeout, WithReason(SilentMessage, failure.DriverText()),
                             SilentAdvice, failure.DriverText())
                   : failure;
    } catch (const DataException& error) {
        return OfLibrary(FailureKind::BadData, error);
    } catch (const IOException& error) {
        return OfTransfer(error);
    } catch (const Utilities::Exceptions::InvalidArgumentException& error) {
        // The library's text does not say why; the code is still that of the failure.
        return Tidy(error.what()) == MissingLockText ? DescribeMissingLock(Platform::LastError())
                                                     : OfLibrary(FailureKind::Other, error);
    } catch (const Utilities::Exceptions::TraceableException& error) {
        return OfLibrary(FailureKind::Other, error);
    } catch (const std::bad_alloc&) {
        return {FailureKind::Other, "not enough memory"};
    } catch (const std::exception& error) {
        return {FailureKind::Other, error.what()};
    } catch (...) {
        return {FailureKind::Other, "unknown error"};
    }
}

}  // namespace Varnholt::Service
