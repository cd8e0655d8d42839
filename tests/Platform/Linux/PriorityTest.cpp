#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include "Platform/Threads.h"

namespace Varnholt::Platform {
namespace {

int NiceValue() {
    return getpriority(PRIO_PROCESS, static_cast<id_t>(gettid()));
}

/// Runs in a process of its own; the answer is its exit code.
int RaiseAndRestore(bool isPrivileged) {
    if (!isPrivileged) {
        const rlimit none{0, 0};
        if (setrlimit(RLIMIT_NICE, &none) != 0 || (geteuid() == 0 && setuid(65534) != 0)) {
            return 77;
        }
    }
    const int before = NiceValue();
    for (int i = 0; i < 3; ++i) {
        if (!SetCurrentThreadPriority(HighestThreadPriority)) {
            return 1;
        }
        if (isPrivileged && NiceValue() >= before) {
            return 2;
        }
        if (!SetCurrentThreadPriority(0) || NiceValue() != before) {
            return 3;
        }
    }
    return 0;
}

/// A scan raises its thread and lowers it again; a thread that could not be raised must not end up lower.
TEST(Priorities, AreRestoredWhetherTheyCouldBeRaisedOrNot) {
    for (const bool isPrivileged : {true, false}) {
        if (isPrivileged && geteuid() != 0) {
            continue;
        }
        const pid_t child = fork();
        if (child == 0) {
            _exit(RaiseAndRestore(isPrivileged));
        }
        int status = 0;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        ASSERT_TRUE(WIFEXITED(status));
        EXPECT_EQ(WEXITSTATUS(status), 0) << (isPrivileged ? "privileged" : "not privileged");
    }
}

}  // namespace
}  // namespace Varnholt::Platform
