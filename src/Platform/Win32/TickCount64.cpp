#include <atomic>
#include <cstdint>

#include "Platform/Win32/Windows.h"

/// The compiler's thread library calls `GetTickCount64`, which Windows XP does not have: a program that
/// imports it is not loaded there. So the reference is answered from here, ahead of the system's import
/// library.
namespace {

ULONGLONG WINAPI ExtendedTickCount() {
    constexpr std::uint64_t LowWord = 0xFFFFFFFF;
    constexpr std::uint64_t Wrap = LowWord + 1;
    static std::atomic<std::uint64_t> latest = 0;

    std::uint64_t before = latest.load();
    for (;;) {
        std::uint64_t now = (before & ~LowWord) | ::GetTickCount();
        if (now < before) {
            // Either the count has wrapped, or another thread has read a later one meanwhile.
            if (before - now < Wrap / 2) {
                return before;
            }
            now += Wrap;
        }
        if (latest.compare_exchange_weak(before, now)) {
            return now;
        }
    }
}

}  // namespace

extern "C" {
/// The import table's slot, under the name that a call through it refers to.
extern decltype(&ExtendedTickCount) const importedGetTickCount64 __asm__("__imp__GetTickCount64@0");
decltype(&ExtendedTickCount) const importedGetTickCount64 = ExtendedTickCount;
}
