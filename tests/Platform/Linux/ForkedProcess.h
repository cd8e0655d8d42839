#pragma once

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <functional>

namespace Varnholt::Platform {

/// Another process, which runs `body` and ends with its answer.
class ForkedProcess final {
  public:
    explicit ForkedProcess(const std::function<int()>& body) : process_(fork()) {
        if (process_ == 0) {
            _exit(body());
        }
    }
    ~ForkedProcess() { Kill(); }
    ForkedProcess(const ForkedProcess&) = delete;
    ForkedProcess& operator=(const ForkedProcess&) = delete;

    /// As if it had crashed: it runs no further instruction.
    void Kill() {
        if (process_ > 0) {
            kill(process_, SIGKILL);
            WaitForExit();
        }
    }
    pid_t Id() const { return process_; }
    /// Its exit code; -1 when it did not come to its end.
    int WaitForExit() {
        int status = -1;
        waitpid(process_, &status, 0);
        process_ = -1;
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }

  private:
    pid_t process_;
};

}  // namespace Varnholt::Platform
