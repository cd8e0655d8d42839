#pragma once

#include <string>
#include <vector>

namespace Varnholt::Service {

/// A process that has a device open.
struct DeviceHolder {
    int processId = 0;
    std::string name;
};

/// The other processes that have this device node open, as far as the caller may see them (root sees all).
std::vector<DeviceHolder> FindHolders(const std::string& deviceNode);

}  // namespace Varnholt::Service
