#pragma once

// The one place where the Windows headers come in. The library runs on Windows XP and later; the headers are
// told so, so that nothing newer can be called by mistake.
#ifndef WIN32_LEAN_AND_MEAN
#define WIN32_LEAN_AND_MEAN
#endif
#ifndef NOMINMAX
#define NOMINMAX
#endif
#if !defined(_WIN32_WINNT) || _WIN32_WINNT > 0x0501
#undef _WIN32_WINNT
#define _WIN32_WINNT 0x0501
#endif
#include <windows.h>

namespace Varnholt::Platform {

/// The entry point `name` of a loaded module, or null.
template <typename Function>
Function* FindEntryPoint(HMODULE module, const char* name) {
    return reinterpret_cast<Function*>(reinterpret_cast<void*>(::GetProcAddress(module, name)));
}

}  // namespace Varnholt::Platform
