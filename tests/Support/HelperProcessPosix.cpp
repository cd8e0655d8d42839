#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>

#include "Support/HelperProcess.h"

namespace Varnholt::TestSupport {

struct HelperProcess::Impl {
    pid_t process = -1;
};

HelperProcess::HelperProcess(const std::string& helper, const std::vector<std::string>& arguments)
    : impl_(std::make_unique<Impl>()) {
    std::vector<std::string> texts{"helper", "--helper", helper};
    texts.insert(texts.end(), arguments.begin(), arguments.end());
    std::vector<char*> pointers;
    for (std::string& text : texts) {
        pointers.push_back(text.data());
    }
    pointers.push_back(nullptr);
    if (posix_spawn(&impl_->process, "/proc/self/exe", nullptr, nullptr, pointers.data(), environ) != 0) {
        impl_->process = -1;
    }
}

HelperProcess::~HelperProcess() {
    Kill();
}

int HelperProcess::WaitForExit() {
    int status = 0;
    if (impl_->process <= 0 || waitpid(impl_->process, &status, 0) != impl_->process) {
        return -1;
    }
    impl_->process = -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

void HelperProcess::Kill() {
    if (impl_->process > 0) {
        kill(impl_->process, SIGKILL);
        WaitForExit();
    }
}

}  // namespace Varnholt::TestSupport
