#pragma once

#include "Platform/Owned.h"

namespace Varnholt::Platform {

/// Names a waitable object, a thread or an open device file. A handle that names nothing is refused with
/// `Errors::InvalidHandle`, whatever its value; it is never dereferenced by callers. Whoever hands out
/// handles keeps to its own values, so that the handle of one is never taken for that of another: the
/// system's on Windows are 0 modulo 4, waitable objects and threads on other platforms 1, files of `Drivers`
/// 2; 3 is `InvalidHandle`.
using Handle = void*;
inline constexpr Handle NoHandle = nullptr;

/// What an open that failed returns, as opposed to `NoHandle`.
Handle InvalidHandle();

/// Closes a waitable object or thread handle. The object lives on while a wait or a thread still needs it.
bool Close(Handle handle);

/// Owns one waitable object or thread handle.
using OwnedHandle = Owned<Handle, NoHandle, Close>;

}  // namespace Varnholt::Platform
