#include <gtest/gtest.h>
#include <sys/resource.h>

#include "ForkedProcess.h"
#include "Platform/Threads.h"

namespace Varnholt::Platform {
namespace {

int NiceValue() {
    return getpriority(PRIO_PROCESS, static_cast<id_t>(gettid()));
}

/// A scan raises its thread and lowers it again; a thread that could not be raised must not end up lower.
TEST(Priorities, AreRestoredWhetherTheyCouldBeRaisedOrNot) {
    for (const bool isPrivileged : {true, false}) {
        if (isPrivileged && geteuid() != 0) {
            continue;
        }
        ForkedProcess process([isPrivileged] {
            const rlimit none{0, 0};
            if (!isPrivileged &&
                (setrlimit(RLIMIT_NICE, &none) != 0 || (geteuid() == 0 && setuid(65534) != 0))) {
                return 1;
            }
            const int before = NiceValue();
            for (int i = 0; i < 3; ++i) {
                if (!SetCurrentThreadPriority(1) || (isPrivileged && NiceValue() != before - 5)) {
                    return 2;
                }
                if (!SetCurrentThreadPriority(0) || NiceValue() != before) {
                    return 3;
                }
            }
            return 0;
        });
        EXPECT_EQ(process.WaitForExit(), 0) << (isPrivileged ? "privileged" : "not privileged");
    }
}

}  // namespace
}  // namespace Varnholt::Platform
