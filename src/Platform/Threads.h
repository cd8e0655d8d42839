#pragma once

#include <cstdint>

#include "Platform/Handle.h"

namespace Varnholt::Platform {

/// A thread's body. Nothing may be thrown out of it.
using ThreadEntry = std::uint32_t (*)(void* argument);

/// Starts a thread with the default stack size; `NoHandle` on failure. The handle is signalled when the
/// thread has ended; closing it leaves the thread alone.
Handle StartThread(ThreadEntry entry, void* argument);

/// Ends a thread by force where the platform can: true when the thread will run no further instruction. A
/// platform that cannot (Linux) answers false at once and leaves the thread alone; the caller must then see
/// that the thread's own waits end, and must not free what the thread still uses.
bool EndThreadByForce(Handle thread, std::uint32_t exitCode);

/// Priority levels as on Windows, -2 to 2 around 0. A level the system refuses changes nothing.
inline constexpr int HighestThreadPriority = 2;
int CurrentThreadPriority();
bool SetCurrentThreadPriority(int level);

/// Suspends the caller; 0 gives up the rest of its time slice.
void SleepMilliseconds(std::uint32_t milliseconds);

}  // namespace Varnholt::Platform
