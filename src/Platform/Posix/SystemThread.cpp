#include "Platform/Posix/SystemThread.h"

#include <signal.h>

#include <initializer_list>

namespace Varnholt::Platform::Posix {

bool StartSystemThread(pthread_t& thread, void* (*entry)(void*), void* argument) {
    sigset_t blocked;
    sigset_t before;
    sigfillset(&blocked);
    for (const int fault : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGABRT, SIGTRAP, SIGSYS}) {
        sigdelset(&blocked, fault);
    }
    pthread_sigmask(SIG_SETMASK, &blocked, &before);
    const bool started = pthread_create(&thread, nullptr, entry, argument) == 0;
    pthread_sigmask(SIG_SETMASK, &before, nullptr);
    return started;
}

}  // namespace Varnholt::Platform::Posix
