#include "ShippedLibrary.h"

#include <stdexcept>

namespace Varnholt::Tests {

std::string ShippedLibrary::path;

ShippedLibrary::ShippedLibrary() : module(LoadLibraryA(path.c_str())) {
    if (module == nullptr) {
        throw std::runtime_error(path + " does not load: error " + std::to_string(GetLastError()));
    }
    writeImage_ = Platform::FindEntryPoint<decltype(f3355d91d5df0e0b)>(module, "f3355d91d5df0e0b");
    takeReadout_ = Platform::FindEntryPoint<decltype(d4fb86cecc88582a)>(module, "d4fb86cecc88582a");
    getInformation_ = Platform::FindEntryPoint<decltype(b5ae189db26b2a1b)>(module, "b5ae189db26b2a1b");
}

}  // namespace Varnholt::Tests
