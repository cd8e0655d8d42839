#pragma once

#include <string>
#include <vector>

#include "Protocol/Guid.h"

namespace Varnholt::Platform {

/// The paths of a class's interfaces as NT hosts before version 5 keep them: as the names of registry values.
/// In the order of the registry.
std::vector<std::string> ListRegistryInterfaces(const Protocol::Guid& interfaceClass);

/// Whether the name of such a value begins with the identifier of the class.
bool NamesInterfaceOf(const Protocol::Guid& interfaceClass, const std::string& valueName);

}  // namespace Varnholt::Platform
