#pragma once

#include <exception>
#include <stdexcept>
#include <string>

#include "ExitCode.h"

namespace Varnholt::Cli {

/// A failure that the tool itself finds: what went wrong, naming the thing, and the way out where there is
/// one (may be empty).
class ToolFailure final : public std::runtime_error {
  public:
    ToolFailure(ExitCode exitCode, const std::string& message, std::string wayOut = {})
        : std::runtime_error(message), code_(exitCode), advice_(std::move(wayOut)) {}

    ExitCode Code() const { return code_; }
    const std::string& Advice() const { return advice_; }

  private:
    ExitCode code_;
    std::string advice_;
};

/// A failure as the user reads it.
struct FailureReport {
    ExitCode code;
    std::string message;
    std::string advice;
};

/// Sorts any exception, the library's or the tool's, into its class of failure.
FailureReport Describe(const std::exception_ptr& failure);

}  // namespace Varnholt::Cli
