#pragma once

#include <pthread.h>

namespace Varnholt::Platform::Posix {

/// Starts a thread of the system that takes none of the signals that belong to the host: their handlers must
/// not find themselves on a thread that the host knows nothing of.
bool StartSystemThread(pthread_t& thread, void* (*entry)(void*), void* argument);

}  // namespace Varnholt::Platform::Posix
