#pragma once

#include <random>
#include <string>

namespace Varnholt::Platform {

/// A name for a named object that no other run of the tests uses, be it at the same time or crashed before.
inline std::string UniqueName(const std::string& purpose) {
    static const std::string run = std::to_string(std::random_device{}());
    return "ostra-test-" + run + "-" + purpose;
}

}  // namespace Varnholt::Platform
