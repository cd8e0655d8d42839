#pragma once

#include <string>

namespace Varnholt::Service {

/// Which other process uses the instrument, as "NAME (process NUMBER)"; empty where that cannot be seen.
std::string HolderOf(const std::string& identifier);

}  // namespace Varnholt::Service
