#include "Platform/Linux/HostSignalsBlocked.h"

#include <initializer_list>

namespace Varnholt::Platform::Linux {

HostSignalsBlocked::HostSignalsBlocked() {
    sigset_t blocked;
    sigfillset(&blocked);
    for (const int fault : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGABRT, SIGSYS}) {
        sigdelset(&blocked, fault);
    }
    pthread_sigmask(SIG_SETMASK, &blocked, &before_);
}

HostSignalsBlocked::~HostSignalsBlocked() {
    pthread_sigmask(SIG_SETMASK, &before_, nullptr);
}

}  // namespace Varnholt::Platform::Linux
