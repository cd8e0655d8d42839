#pragma once

#include <memory>
#include <string>

#include "Platform/Linux/MutexObject.h"

namespace Varnholt::Platform::Linux {

/// The mutex that all processes of the user share under this name. Null on failure with the reason in
/// `LastError`.
std::shared_ptr<MutexObject> OpenSharedMutex(const std::string& name);

}  // namespace Varnholt::Platform::Linux
