#pragma once

#include <pybind11/pybind11.h>

#include <atomic>
#include <optional>

namespace Varnholt::Python {

/// Gives up the interpreter's lock for its life. Where a thread comes back to an interpreter that has begun
/// to end, Python ends the thread, which C++ frames do not survive: so those that are away are counted, and
/// waited for before.
class Away final {
  public:
    Away() = default;
    Away(const Away&) = delete;
    Away& operator=(const Away&) = delete;

    /// Threads that are away, and those that are just coming back.
    static int Count() { return count.load(); }
    /// In a forked process, where there are no other threads.
    static void ForgetOthers() { count = 0; }

  private:
    class Counted final {
      public:
        Counted() { ++count; }
        ~Counted() { --count; }
        Counted(const Counted&) = delete;
        Counted& operator=(const Counted&) = delete;
    };

    static inline std::atomic<int> count{0};
    const Counted counted_;  // to the end of what follows
    const pybind11::gil_scoped_release released_;
};

/// The same where this thread has the lock: the last reference to an object can go in either state.
class AwayIfHere final {
  public:
    AwayIfHere() {
        if (PyGILState_Check() != 0) {
            away_.emplace();
        }
    }

  private:
    std::optional<Away> away_;
};

}  // namespace Varnholt::Python
