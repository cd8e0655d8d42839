#include "Platform/Posix/SystemThread.h"

#include "Platform/Posix/HostSignalsBlocked.h"

namespace Varnholt::Platform::Posix {

bool StartSystemThread(pthread_t& thread, void* (*entry)(void*), void* argument) {
    const HostSignalsBlocked blocked;
    return pthread_create(&thread, nullptr, entry, argument) == 0;
}

}  // namespace Varnholt::Platform::Posix
