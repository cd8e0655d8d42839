#include "ChildProcess.h"

#include "ShippedLibrary.h"

namespace Varnholt::Tests {
namespace {

constexpr const char* ReadyEvent = "ostra-test-child-is-ready";

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
    : ChildProcess('"' + ThisProgram() + "\" \"" + ShippedLibrary::path + "\" " + task + " \"" + argument +
                   '"') {}

ChildProcess::ChildProcess(std::string commandLine) : ready(CreateEventA(nullptr, FALSE, FALSE, ReadyEvent)) {
    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    CreateProcessA(nullptr, commandLine.data(), nullptr, nullptr, FALSE, 0, nullptr, nullptr, &startup,
                   &process);
}

ChildProcess::~ChildProcess() {
    WaitForSingleObject(process.hProcess, 20'000);
    CloseHandle(process.hThread);
    CloseHandle(process.hProcess);
    CloseHandle(ready);
}

bool ChildProcess::IsReady() {
    return WaitForSingleObject(ready, 10'000) == WAIT_OBJECT_0;
}

DWORD ChildProcess::Wait() {
    DWORD code = STILL_ACTIVE;
    WaitForSingleObject(process.hProcess, 20'000);
    GetExitCodeProcess(process.hProcess, &code);
    return code;
}

int RunAsChild(const std::string& task, const std::string& argument) {
    if (task == "readout") {
        return ShippedLibrary().TakeReadout(argument);
    }
    return HoldLock(argument, task == "abandon-lock");
}

}  // namespace Varnholt::Tests
