#pragma once

#include <random>
#include <string>

namespace Varnholt::Platform {

/// Of this run of the tests, and the same in processes that it forks.
inline const std::string RunNumber = std::to_string(std::random_device{}());

/// A name for a named object that no other run of the tests uses, be it at the same time or crashed before.
inline std::string UniqueName(const std::string& purpose) {
    return "ostra-test-" + RunNumber + "-" + purpose;
}

}  // namespace Varnholt::Platform
