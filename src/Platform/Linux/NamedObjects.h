#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "Platform/Linux/MutexObject.h"
#include "Platform/Linux/SemaphoreObject.h"

namespace Varnholt::Platform::Linux {

/// The objects that have a name: one for every process, except where threads take turns. Virtual time cannot
/// wait for other processes, and the tests that run at the same time are to be left alone. Null on failure
/// with the reason in `LastError`.
std::shared_ptr<MutexObject> OpenNamedMutex(const std::string& name);
/// The counts are those of the first that opens the name.
std::shared_ptr<SemaphoreObject> OpenNamedSemaphore(std::int32_t initialCount, std::int32_t maximumCount,
                                                    const std::string& name);

}  // namespace Varnholt::Platform::Linux
