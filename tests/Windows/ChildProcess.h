#pragma once

#include <string>

#include "Platform/Win32/Windows.h"

namespace Varnholt::Tests {

/// A second process, running this program for one task.
class ChildProcess final {
  public:
    /// Tasks:
    /// - "readout": takes a readout of the instrument that `argument` names; ends with its result code;
    /// - "hold-lock": holds the named lock `argument` for `HoldMilliseconds` once it is ready;
    /// - "abandon-lock": the same, but ends without giving it back.
    ChildProcess(const std::string& task, const std::string& argument);
    /// Another program; what it prints goes to the file `output` if it has a name.
    struct Program {
        std::string commandLine;
        std::string output{};
    };
    explicit ChildProcess(Program program);
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    static constexpr DWORD HoldMilliseconds = 1500;

    /// Waits until it says that it is ready; false if it does not.
    bool IsReady();
    /// Waits for its end and gives its exit code.
    DWORD Wait();

  private:
    HANDLE ready_;
    PROCESS_INFORMATION process_{};
};

/// The child's side: its exit code.
int RunAsChild(const std::string& task, const std::string& argument);

}  // namespace Varnholt::Tests
