#pragma once

#include <pthread.h>

namespace Varnholt::Platform::Linux {

/// Starts a thread of the system that takes none of the host's signals.
bool StartSystemThread(pthread_t& thread, void* (*entry)(void*), void* argument);

}  // namespace Varnholt::Platform::Linux
