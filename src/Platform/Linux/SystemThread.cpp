#include "Platform/Linux/SystemThread.h"

#include "Platform/Linux/HostSignalsBlocked.h"

namespace Varnholt::Platform::Linux {

bool StartSystemThread(pthread_t& thread, void* (*entry)(void*), void* argument) {
    const HostSignalsBlocked blocked;
    return pthread_create(&thread, nullptr, entry, argument) == 0;
}

}  // namespace Varnholt::Platform::Linux
