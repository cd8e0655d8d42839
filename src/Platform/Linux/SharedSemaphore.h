#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "Platform/Linux/SemaphoreObject.h"

namespace Varnholt::Platform::Linux {

/// The semaphore that all processes of the user share under this name; the counts are those of the first that
/// opens it. Null on failure with the reason in `LastError`.
std::shared_ptr<SemaphoreObject> OpenSharedSemaphore(std::int32_t initialCount, std::int32_t maximumCount,
                                                     const std::string& name);

}  // namespace Varnholt::Platform::Linux
