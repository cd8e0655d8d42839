#pragma once

#include <memory>
#include <string>
#include <vector>

namespace Varnholt::TestSupport {

/// The test program itself, run once more to do something in a process of its own: its `main` must call
/// `RunHelper` first, with the helpers that it has.
class HelperProcess final {
  public:
    HelperProcess(const std::string& helper, const std::vector<std::string>& arguments);
    /// Ends it by force if it still runs.
    ~HelperProcess();
    HelperProcess(const HelperProcess&) = delete;
    HelperProcess& operator=(const HelperProcess&) = delete;

    /// Its exit code; -1 when it was ended by force or could not be started.
    int WaitForExit();
    /// As if it had crashed: it runs no further instruction of its own.
    void Kill();

  private:
    struct Impl;
    const std::unique_ptr<Impl> impl_;
};

struct Helper {
    const char* name;
    int (*run)(const std::vector<std::string>& arguments);
};

/// True when this process was started as a helper, which has then run; `exitCode` is what `main` is to
/// return.
bool RunHelper(int argumentCount, char** arguments, const std::vector<Helper>& helpers, int& exitCode);

}  // namespace Varnholt::TestSupport
