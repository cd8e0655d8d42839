#include "ChildProcess.h"

#include "ShippedLibrary.h"

namespace Varnholt::Tests {
namespace {

constexpr const char* ReadyEvent = "ostra-test-child-is-ready";
constexpr DWORD LongestRun = 120'000;  // milliseconds; in an emulated machine a program is slow

int HoldLock(const std::string& name, bool abandon) {
    const HANDLE lock = CreateMutexA(nullptr, FALSE, name.c_str());
    if (WaitForSingleObject(lock, 5000) != WAIT_OBJECT_0) {
        return 1;
    }
    SetEvent(OpenEventA(EVENT_MODIFY_STATE, FALSE, ReadyEvent));
    Sleep(ChildProcess::HoldMilliseconds);
    if (!abandon) {
        ReleaseMutex(lock);
    }
    return 0;
}

std::string ThisProgram() {
    char program[MAX_PATH] = "";
    GetModuleFileNameA(nullptr, program, sizeof program);
    return program;
}

}  // namespace

ChildProcess::ChildProcess(const std::string& task, const std::string& argument)
    : ChildProcess(Program{'"' + ThisProgram() + "\" \"" + ShippedLibrary::path + "\" " + task + " \"" +
                           argument + '"'}) {}

ChildProcess::ChildProcess(Program program) : ready_(CreateEventA(nullptr, FALSE, FALSE, ReadyEvent)) {
    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    SECURITY_ATTRIBUTES inherited{sizeof inherited, nullptr, TRUE};
    HANDLE file = nullptr;
    if (!program.output.empty()) {
        file = CreateFileA(program.output.c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE,
                           &inherited, CREATE_ALWAYS, 0, nullptr);
        startup.dwFlags = STARTF_USESTDHANDLES;
        startup.hStdOutput = file;
        startup.hStdError = file;
    }
    CreateProcessA(nullptr, program.commandLine.data(), nullptr, nullptr, file != nullptr, 0, nullptr,
                   nullptr, &startup, &process_);
    CloseHandle(file);
}

ChildProcess::~ChildProcess() {
    WaitForSingleObject(process_.hProcess, LongestRun);
    CloseHandle(process_.hThread);
    CloseHandle(process_.hProcess);
    CloseHandle(ready_);
}

bool ChildProcess::IsReady() {
    return WaitForSingleObject(ready_, 10'000) == WAIT_OBJECT_0;
}

DWORD ChildProcess::Wait() {
    DWORD code = STILL_ACTIVE;
    WaitForSingleObject(process_.hProcess, LongestRun);
    GetExitCodeProcess(process_.hProcess, &code);
    return code;
}

int RunAsChild(const std::string& task, const std::string& argument) {
    if (task == "readout") {
        return ShippedLibrary().TakeReadout(argument);
    }
    return HoldLock(argument, task == "abandon-lock");
}

}  // namespace Varnholt::Tests
