#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <vector>

#include "ostra.h"
#include "Platform/Win32/Windows.h"

namespace Varnholt::Tests {

/// ostra.dll, loaded as a host loads it.
class ShippedLibrary final {
  public:
    /// The paths of what is tested, as the command line gave them.
    static std::string path;

    ShippedLibrary();
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

    HMODULE module;

  private:
    decltype(&f3355d91d5df0e0b) writeImage_;
    decltype(&d4fb86cecc88582a) takeReadout_;
    decltype(&b5ae189db26b2a1b) getInformation_;
};

}  // namespace Varnholt::Tests
