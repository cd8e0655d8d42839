#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {

using Varnholt::Utilities::Exceptions::RuntimeException;

/// How much of its data a transfer moved, where that is not what it was asked for. Bytes.
struct Shortfall {
    std::uint32_t moved;
    std::uint32_t asked;
};

/// What is known of a failure beside its text is there for those who sort failures: texts are for people.
class DeviceDriverException : public RuntimeException {
  public:
    using RuntimeException::RuntimeException;
    DeviceDriverException(const std::string& message, const std::string& location, std::uint32_t failureCode)
        : RuntimeException(message, location), code_(failureCode) {}
    DeviceDriverException(const std::string& message, const std::string& location,
                          const Shortfall& missingData)
        : RuntimeException(message, location), shortfall_(missingData) {}

    /// The operating system's (`Platform::Errors`) or the USBIO driver's (`Protocol::UsbIoDriver::Status`)
    /// number for the failure; the two ranges do not meet.
    std::optional<std::uint32_t> Code() const { return code_; }
    /// Of a transfer that succeeded and moved another number of bytes.
    std::optional<Shortfall> MissingData() const { return shortfall_; }

  private:
    std::optional<std::uint32_t> code_;
    std::optional<Shortfall> shortfall_;
};
/// Stored or received data that does not fit.
class DataException final : public DeviceDriverException {
  public:
    using DeviceDriverException::DeviceDriverException;
};
/// A transfer that failed or a device that cannot be opened.
class IOException final : public DeviceDriverException {
  public:
    using DeviceDriverException::DeviceDriverException;
};
/// A wait that ran out or was abandoned.
class TimeoutException final : public DeviceDriverException {
  public:
    using DeviceDriverException::DeviceDriverException;
};

}  // namespace Varnholt::DeviceDriver::Generic::Utilities

/// What the whole driver throws with.
namespace Varnholt::DeviceDriver {
using Generic::Utilities::DataException;
using Generic::Utilities::IOException;
using Generic::Utilities::Shortfall;
using Generic::Utilities::TimeoutException;
using Varnholt::Utilities::Exceptions::Here;
using Varnholt::Utilities::Exceptions::ResourceException;
using Varnholt::Utilities::Exceptions::RuntimeException;
using Varnholt::Utilities::Exceptions::SourceLocation;
}  // namespace Varnholt::DeviceDriver
