#pragma once

#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::DeviceDriver::Generic::Utilities {

using Varnholt::Utilities::Exceptions::RuntimeException;

struct DeviceDriverException : RuntimeException {
    using RuntimeException::RuntimeException;
};
/// Stored or received data that does not fit.
struct DataException final : DeviceDriverException {
    using DeviceDriverException::DeviceDriverException;
};
/// A transfer that failed or a device that cannot be opened.
struct IOException final : DeviceDriverException {
    using DeviceDriverException::DeviceDriverException;
};
/// A wait that ran out or was abandoned.
struct TimeoutException final : DeviceDriverException {
    using DeviceDriverException::DeviceDriverException;
};

}  // namespace Varnholt::DeviceDriver::Generic::Utilities
