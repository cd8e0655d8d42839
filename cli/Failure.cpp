#include "Failure.h"

#include <array>
#include <charconv>
#include <ios>
#include <new>
#include <string_view>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Platform/ErrorCodes.h"
#include "Protocol/UsbIoDriver.h"
#include "SystemCommands.h"
#include "Utilities/Exceptions/Exceptions.h"

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

/// Texts of the transports for an instrument that is not in the list.
constexpr std::array<std::string_view, 3> MissingTexts{"No devices connected", "No such device connected",
                                                       "requested device not found"};

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

FailureReport OfTransfer(const std::string& text) {
    for (const std::string_view missing : MissingTexts) {
        if (text == missing) {
            return {ExitCode::NoInstrument, WithReason(UnpluggedMessage, text), UnpluggedAdvice};
        }
    }
    if (const auto code = SystemCodeIn(text)) {
        for (const CodeMeaning& meaning : Meanings) {
            if (meaning.code == *code) {
                return {meaning.exitCode, WithReason(meaning.message, text), meaning.advice};
            }
        }
    }
    return {ExitCode::InputOutput, WithReason("a transfer failed", text), SystemAdvice::TransferFailed};
}

}  // namespace

std::optional<std::uint32_t> SystemCodeIn(const std::string& text) {
    struct Form {
        std::string_view lead;
        int base;
    };
    for (const Form& form : {Form{"Win32 Error (", 10}, Form{"Error code 0x", 16}}) {
        const std::size_t at = text.rfind(form.lead);
        if (at == std::string::npos) {
            continue;
        }
        const char* const first = text.data() + at + form.lead.size();
        std::uint32_t code = 0;
        if (std::from_chars(first, text.data() + text.size(), code, form.base).ec == std::errc()) {
            return code;
        }
    }
    return std::nullopt;
}

FailureReport Describe(const std::exception_ptr& failure) {
    using namespace DeviceDriver::Generic::Utilities;
    try {
        std::rethrow_exception(failure);
    } catch (const ToolFailure& exception) {
        return {exception.Code(), exception.what(), exception.Advice()};
    } catch (const TimeoutException& exception) {
        // A transfer that a removed instrument cannot even begin is reported as a wait that failed.
        FailureReport report = OfTransfer(Tidy(exception.what()));
        if (report.code == ExitCode::InputOutput) {
            report = {ExitCode::Timeout, WithReason(SilentMessage, Tidy(exception.what())), SilentAdvice};
        }
        return report;
    } catch (const DataException& exception) {
        return {ExitCode::BadData, Tidy(exception.what()), {}};
    } catch (const IOException& exception) {
        return OfTransfer(Tidy(exception.what()));
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
