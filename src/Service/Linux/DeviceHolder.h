#pragma once

#include <string>

namespace Varnholt::Service {

/// Another process that has this device node open, as "NAME (process NUMBER)"; empty where there is none that
/// the caller may see (root sees all).
std::string FindHolder(const std::string& deviceNode);

}  // namespace Varnholt::Service
