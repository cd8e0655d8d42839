#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "Platform/Posix/MutexObject.h"
#include "Platform/Posix/SemaphoreObject.h"

namespace Varnholt::Platform::Posix {

/// The objects that have a name, and are one for all processes. Null on failure with the reason in
/// `LastError`.
std::shared_ptr<MutexObject> OpenSharedMutex(const std::string& name);
/// The counts are those of the first process that opens the name.
std::shared_ptr<SemaphoreObject> OpenSharedSemaphore(std::int32_t initialCount, std::int32_t maximumCount,
                                                     const std::string& name);

}  // namespace Varnholt::Platform::Posix
