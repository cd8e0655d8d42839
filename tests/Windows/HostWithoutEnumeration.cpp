// A host on a system whose setupapi is missing or lacks an entry point: the library finds no instrument,
// keeps nothing of what it loaded, and says nothing. Run by the test of the shipped library under names for
// which Wine has such a setupapi. Exit code: 0, or the number of the expectation that failed.
#include <cstdio>
#include <vector>

#include "ShippedLibrary.h"

int main(int argc, char** argv) {
    using Varnholt::Tests::ShippedLibrary;
    if (argc < 2) {
        return 100;
    }
    const auto handles = [] {
        DWORD count = 0;
        GetProcessHandleCount(GetCurrentProcess(), &count);
        return count;
    };
    ShippedLibrary::path = argv[1];
    ShippedLibrary library;
    for (int round = 0; round < 3; ++round) {
        const DWORD before = handles();
        if (library.TakeReadout("") != OSTRA_FAILURE) {
            return 1;
        }
        if (!library.LastError().empty()) {
            return 2;
        }
        if (library.WriteImage(std::vector<std::uint8_t>(OSTRA_IMAGE_SIZE), "") != OSTRA_UNKNOWN_FAILURE) {
            return 3;
        }
        if (!library.LastError().empty()) {
            return 4;
        }
        if (GetModuleHandleA("setupapi.dll") != nullptr) {
            return 5;
        }
        // What the system opens for itself when it is first asked does not count.
        if (round > 0 && handles() != before) {
            return 6;
        }
    }
    return 0;
}
