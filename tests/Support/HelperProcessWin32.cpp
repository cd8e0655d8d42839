#include <windows.h>

#include "Support/HelperProcess.h"

namespace Varnholt::TestSupport {

struct HelperProcess::Impl {
    HANDLE process = nullptr;
};

HelperProcess::HelperProcess(const std::string& helper, const std::vector<std::string>& arguments)
    : impl_(std::make_unique<Impl>()) {
    char program[MAX_PATH] = {};
    GetModuleFileNameA(nullptr, program, MAX_PATH - 1);
    std::string command = "\"" + std::string(program) + "\" --helper " + helper;
    for (const std::string& argument : arguments) {
        command += " \"" + argument + "\"";
    }
    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    PROCESS_INFORMATION started{};
    if (CreateProcessA(program, command.data(), nullptr, nullptr, FALSE, 0, nullptr, nullptr, &startup,
                       &started)) {
        CloseHandle(started.hThread);
        impl_->process = started.hProcess;
    }
}

HelperProcess::~HelperProcess() {
    Kill();
}

int HelperProcess::WaitForExit() {
    if (!impl_->process) {
        return -1;
    }
    WaitForSingleObject(impl_->process, INFINITE);
    DWORD code = 0;
    GetExitCodeProcess(impl_->process, &code);
    CloseHandle(impl_->process);
    impl_->process = nullptr;
    return static_cast<int>(code);
}

void HelperProcess::Kill() {
    if (impl_->process) {
        TerminateProcess(impl_->process, static_cast<UINT>(-1));
        WaitForExit();
    }
}

}  // namespace Varnholt::TestSupport
