#pragma once

#include <exception>
#include <string>

namespace Varnholt::Service {

enum class FailureKind {
    Other,           ///< none of the others
    BadArgument,     ///< what was asked for cannot be understood, or not be done so
    NotFound,        ///< no instrument is connected, or not the one that was named
    Unplugged,       ///< the instrument is not there any more
    InUse,           ///< another process has the instrument
    NoPermission,    ///< to open the instrument, or to change the system
    NoLock,          ///< the system does not give what keeps processes apart
    TransferFailed,  ///< the instrument or the system ended a transfer
    ShortData,       ///< fewer bytes were moved than belong to a command
    Timeout,         ///< the instrument did not answer in time
    BadData,         ///< data or values that cannot be used: an image, a table, an integration time
    File,            ///< a file cannot be read or written
    Different,       ///< what was compared differs
    Interrupted,     ///< the user wants to end
};

/// Why something could not be done. Everything in this namespace that fails throws it; what else the library
/// throws becomes one with `Describe`.
class Failure final : public std::exception {
  public:
    /// `message` names the thing; `wayOut` is what the user can do, empty where nothing is known;
    /// `libraryText` is the library's own, where it is a failure of that.
    Failure(FailureKind failureKind, std::string message, std::string wayOut = {},
            std::string libraryText = {});

    /// The whole text: the instrument's identifier, where the failure is one's, and the message.
    const char* what() const noexcept override { return text_.c_str(); }

    FailureKind Kind() const { return kind_; }
    const std::string& Message() const { return message_; }
    const std::string& Advice() const { return advice_; }
    /// Its identifier; empty: the failure is no instrument's, or names it in its message.
    const std::string& Instrument() const { return instrument_; }
    /// The exception's text as the library has it; empty where the failure is none of the library's.
    const std::string& DriverText() const { return driverText_; }

    /// The same failure with this message, this advice, of this instrument.
    Failure Saying(const std::string& message) const { return With(&Failure::message_, message); }
    Failure Advising(const std::string& wayOut) const { return With(&Failure::advice_, wayOut); }
    Failure Of(const std::string& identifier) const { return With(&Failure::instrument_, identifier); }

    /// Whether the transfer itself failed, with no better reason known.
    bool IsOfTransfer() const;

  private:
    Failure With(std::string Failure::*part, const std::string& value) const;

    FailureKind kind_;
    std::string text_;
    std::string message_;
    std::string advice_;
    std::string instrument_;
    std::string driverText_;
};

/// Sorts any exception into its kind of failure, by its type and code; texts decide nothing.
Failure Describe(const std::exception_ptr& exception);

}  // namespace Varnholt::Service
