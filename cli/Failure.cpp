#include "Failure.h"

#include <fmt/format.h>

#include <array>
#include <ios>
#include <new>
#include <string_view>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Platform/ErrorCodes.h"
#include "Protocol/UsbIoDriver.h"
#include "SystemCommands.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Files/FileError.h"

namespace Varnholt::Cli {
namespace {

namespace Errors = Platform::Errors;
namespace Status = Protocol::UsbIoDriver::Status;

struct CodeMeaning {
    std::uint32_t code;
    ExitCode exitCode;
    const char* message;
    const char* advice;
};

constexpr const char* UnpluggedMessage = "the instrument is not there any more";
constexpr const char* UnpluggedAdvice = "plug it in again; `ostra list` shows whether it is found";
constexpr const char* InUseMessage = "the instrument is used by another process";
constexpr const char* InUseAdvice = "end the other program: an instrument belongs to one process at a time";
constexpr const char* NoPermissionMessage = "no permission to open the instrument";
constexpr const char* SilentMessage = "the instrument did not answer in time";
constexpr const char* SilentAdvice = "unplug it and plug it in again, then try once more";
constexpr std::uint32_t AcquiredExclusively = 0xE0001020;
constexpr std::uint32_t BusTimeout = 0xE0006000;

const std::array Meanings{
    CodeMeaning{Errors::Busy, ExitCode::NotAvailable, InUseMessage, InUseAdvice},
    CodeMeaning{Status::OpenedByOtherProcess, ExitCode::NotAvailable, InUseMessage, InUseAdvice},
    CodeMeaning{AcquiredExclusively, ExitCode::NotAvailable, InUseMessage, InUseAdvice},
    CodeMeaning{Errors::AccessDenied, ExitCode::NotAvailable, NoPermissionMessage,
                SystemAdvice::NoPermission},
    CodeMeaning{Errors::FileNotFound, ExitCode::NoInstrument, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Errors::DeviceNotConnected, ExitCode::NoInstrument, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Status::DeviceRemoved, ExitCode::NoInstrument, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Status::DeviceGone, ExitCode::NoInstrument, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Status::DeviceNotFound, ExitCode::NoInstrument, UnpluggedMessage, UnpluggedAdvice},
    CodeMeaning{Errors::IoIncomplete, ExitCode::Timeout, SilentMessage, SilentAdvice},
    CodeMeaning{Errors::SemaphoreTimeout, ExitCode::Timeout, SilentMessage, SilentAdvice},
    CodeMeaning{Status::TimedOut, ExitCode::Timeout, SilentMessage, SilentAdvice},
    CodeMeaning{BusTimeout, ExitCode::Timeout, SilentMessage, SilentAdvice},
};

/// The library's text for a lock that the system did not make.
constexpr std::string_view MissingLockText = "handle is NULL";

std::string Tidy(std::string text) {
    // A Windows system text ends with a line break of its own.
    for (std::size_t at = 0; (at = text.find_first_of("\r\n", at)) != std::string::npos;) {
        text.erase(at, 1);
    }
    return text;
}

std::string WithReason(const char* message, const std::string& reason) {
    return reason.empty() ? message : std::string(message) + " (" + reason + ")";
}

FailureReport OfTransfer(const DeviceDriver::Generic::Utilities::DeviceDriverException& exception) {
    const std::string text = Tidy(exception.what());
    for (const CodeMeaning& meaning : Meanings) {
        if (exception.Code() == meaning.code) {
            return {meaning.exitCode, WithReason(meaning.message, text), meaning.advice};
        }
    }
    if (const auto missing = exception.MissingData()) {
        const std::string counts = fmt::format("{} of {} bytes came", missing->moved, missing->asked);
        return {ExitCode::InputOutput, text == counts ? counts : WithReason(counts.c_str(), text),
                SystemAdvice::TransferFailed};
    }
    return {ExitCode::InputOutput, WithReason("a transfer failed", text), SystemAdvice::TransferFailed};
}

}  // namespace

FailureReport Describe(const std::exception_ptr& failure) {
    using namespace DeviceDriver::Generic::Utilities;
    try {
        std::rethrow_exception(failure);
    } catch (const ToolFailure& exception) {
        return {exception.Code(), exception.what(), exception.Advice()};
    } catch (const Utilities::Files::FileError& exception) {
        return {ExitCode::File, exception.what(), exception.Advice()};
    } catch (const TimeoutException& exception) {
        // A transfer that a removed instrument cannot even begin is reported as a wait that failed.
        FailureReport report = OfTransfer(exception);
        if (report.code == ExitCode::InputOutput) {
            report = {ExitCode::Timeout, WithReason(SilentMessage, Tidy(exception.what())), SilentAdvice};
        }
        return report;
    } catch (const DataException& exception) {
        return {ExitCode::BadData, Tidy(exception.what()), {}};
    } catch (const IOException& exception) {
        return OfTransfer(exception);
    } catch (const Utilities::Exceptions::InvalidArgumentException& exception) {
        // The library's text does not say why; the code is still that of the failure.
        const std::string text = Tidy(exception.what());
        return text == MissingLockText ? DescribeMissingLock(Platform::LastError())
                                       : FailureReport{ExitCode::Other, text, {}};
    } catch (const Utilities::Exceptions::TraceableException& exception) {
        return {ExitCode::Other, Tidy(exception.what()), {}};
    } catch (const std::bad_alloc&) {
        return {ExitCode::Other, "not enough memory", {}};
    } catch (const std::exception& exception) {
        return {ExitCode::Other, exception.what(), {}};
    } catch (...) {
        return {ExitCode::Other, "unknown error", {}};
    }
}

}  // namespace Varnholt::Cli
