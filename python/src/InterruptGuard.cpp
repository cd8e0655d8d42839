#include "InterruptGuard.h"

#include <semaphore.h>

#include <csignal>
#include <mutex>
#include <thread>

#include "Host.h"

namespace Varnholt::Python {
namespace {

namespace py = pybind11;

/// Takes the signal from the handler, which may do next to nothing, to the interruption of the call that
/// runs.
class Watcher final {
  public:
    static Watcher& Instance() {
        static Watcher* const watcher = new Watcher;  // its thread runs until the process ends
        return *watcher;
    }

    void Set(Service::Interruption* interruption) {
        {
            const std::lock_guard lock(mutex_);
            current_ = interruption;
        }
        if (interruption != nullptr) {
            struct sigaction action {};
            action.sa_sigaction = Handle;
            action.sa_flags = SA_SIGINFO | SA_ONSTACK;
            sigemptyset(&action.sa_mask);
            sigaction(SIGINT, &action, &earlier_);
        } else {
            sigaction(SIGINT, &earlier_, nullptr);
        }
    }

  private:
    Watcher() {
        sem_init(&posted_, 0, 0);
        sigset_t all, before;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &before);
        std::thread([this] { Watch(); }).detach();
        pthread_sigmask(SIG_SETMASK, &before, nullptr);
    }

    static void Handle(int signal, siginfo_t* info, void* context) {
        sem_post(&posted_);
        // Python takes note of the signal as ever.
        if ((earlier_.sa_flags & SA_SIGINFO) != 0) {
            earlier_.sa_sigaction(signal, info, context);
        } else {
            earlier_.sa_handler(signal);
        }
    }

    void Watch() {
        for (;;) {
            while (sem_wait(&posted_) != 0) {
            }
            const std::lock_guard lock(mutex_);
            if (current_ != nullptr) {
                current_->Request();
            }
        }
    }

    static sem_t posted_;
    static struct sigaction earlier_;
    std::mutex mutex_;
    Service::Interruption* current_ = nullptr;  // guarded by mutex_
};

sem_t Watcher::posted_;
struct sigaction Watcher::earlier_ {};

/// An attribute that stays, whatever becomes of the module.
py::handle Attribute(const char* module, const char* name) {
    return py::object(py::module_::import(module).attr(name)).release();
}

bool IsInterruptible() {
    static const auto mainThread =
        py::object(Attribute("threading", "main_thread")().attr("ident")).cast<unsigned long>();
    static const py::handle getHandler = Attribute("_signal", "getsignal");  // makes no enumerator of it
    static const py::handle ownHandler = Attribute("signal", "default_int_handler");
    return PyThread_get_thread_ident() == mainThread && getHandler(SIGINT).is(ownHandler);
}

}  // namespace

InterruptGuard::InterruptGuard(Service::Interruption& interruption)
    : isSet_(!Host::Instance().IsTimeVirtual() && IsInterruptible()) {
    if (isSet_) {
        Watcher::Instance().Set(&interruption);
    }
}

InterruptGuard::~InterruptGuard() {
    if (isSet_) {
        Watcher::Instance().Set(nullptr);
    }
}

void CheckSignals() {
    if (PyErr_CheckSignals() != 0) {
        throw py::error_already_set();
    }
}

void RaiseInterrupt() {
    CheckSignals();
    PyErr_SetNone(PyExc_KeyboardInterrupt);
    throw py::error_already_set();
}

}  // namespace Varnholt::Python
