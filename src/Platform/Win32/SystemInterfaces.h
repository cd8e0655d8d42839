#pragma once

#include <string>
#include <vector>

#include "Protocol/Guid.h"

namespace Varnholt::Platform {

/// The paths of the interfaces of a class that the system itself has, whatever took the place of the device
/// files.
std::vector<std::string> ListSystemInterfaces(const Protocol::Guid& interfaceClass);

}  // namespace Varnholt::Platform
