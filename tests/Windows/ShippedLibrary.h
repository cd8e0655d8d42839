#pragma once

#include <array>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

#include "ostra.h"
#include "Platform/Win32/Windows.h"

namespace Varnholt::Tests {

/// ostra.dll, loaded as a host loads it.
class ShippedLibrary final {
  public:
    /// As the command line gave it.
    inline static std::string path;

    ShippedLibrary() {
        if (module == nullptr) {
            throw std::runtime_error(path + " does not load: error " + std::to_string(GetLastError()));
        }
    }
    ~ShippedLibrary() { FreeLibrary(module); }
    ShippedLibrary(const ShippedLibrary&) = delete;
    ShippedLibrary& operator=(const ShippedLibrary&) = delete;

    std::int32_t WriteImage(const std::vector<std::uint8_t>& image, const std::string& instrument) {
        return writeImage_(image.data(), instrument.c_str());
    }
    std::int32_t TakeReadout(const std::string& instrument) {
        return takeReadout_(values.data(), instrument.c_str());
    }
    std::string LastError() { return getInformation_("LastError"); }

    /// What the last successful readout has stored.
    std::array<std::int32_t, OSTRA_READOUT_VALUES> values{};

    const HMODULE module = LoadLibraryA(path.c_str());

  private:
    decltype(&f3355d91d5df0e0b) writeImage_ =
        Platform::FindEntryPoint<decltype(f3355d91d5df0e0b)>(module, "f3355d91d5df0e0b");
    decltype(&d4fb86cecc88582a) takeReadout_ =
        Platform::FindEntryPoint<decltype(d4fb86cecc88582a)>(module, "d4fb86cecc88582a");
    decltype(&b5ae189db26b2a1b) getInformation_ =
        Platform::FindEntryPoint<decltype(b5ae189db26b2a1b)>(module, "b5ae189db26b2a1b");
};

}  // namespace Varnholt::Tests
