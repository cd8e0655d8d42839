#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <string>

#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Multithreading/Mutex.h"

namespace Varnholt::Utilities::Multithreading {
namespace {

using testing::StrEq;
using testing::ThrowsMessage;

/// Another process that takes a named mutex, says so, and then waits to be told how to end.
class OwnerProcess final {
  public:
    explicit OwnerProcess(const std::string& name) {
        if (pipe(toOwner.data()) != 0 || pipe(fromOwner.data()) != 0) {
            ADD_FAILURE() << "no pipe";
            return;
        }
        process = fork();
        if (process == 0) {
            Mutex mutex(name);
            mutex.Lock();
            char order = 'l';
            if (write(fromOwner[1], &order, 1) != 1 || read(toOwner[0], &order, 1) != 1) {
                _exit(1);
            }
            if (order == 'u') {
                mutex.Unlock();
            }
            _exit(0);
        }
        char held = 0;
        EXPECT_EQ(read(fromOwner[0], &held, 1), 1);
    }
    ~OwnerProcess() {
        for (const int end : {toOwner[0], toOwner[1], fromOwner[0], fromOwner[1]}) {
            close(end);
        }
    }
    OwnerProcess(const OwnerProcess&) = delete;
    OwnerProcess& operator=(const OwnerProcess&) = delete;

    void EndAfterUnlocking() { End('u'); }
    void EndAsOwner() { End('e'); }

  private:
    void End(char order) {
        EXPECT_EQ(write(toOwner[1], &order, 1), 1);
        int status = -1;
        EXPECT_EQ(waitpid(process, &status, 0), process);
        EXPECT_EQ(status, 0);
    }

    std::array<int, 2> toOwner{}, fromOwner{};
    pid_t process = -1;
};

std::string UniqueName(const char* purpose) {
    return "ostra-process-lock-test-" + std::to_string(getpid()) + "-" + purpose;
}

TEST(ProcessLock, NameIsOneLockForAllProcesses) {
    const std::string name = UniqueName("exclusion");
    Mutex mutex(name);
    OwnerProcess owner(name);
    EXPECT_FALSE(mutex.TryLock(0));
    EXPECT_FALSE(mutex.TryLock(20));
    owner.EndAfterUnlocking();
    EXPECT_TRUE(mutex.TryLock(1000));
    mutex.Unlock();
}

TEST(ProcessLock, OwnerThatEndsAbandonsTheMutex) {
    const std::string name = UniqueName("abandoned");
    Mutex mutex(name);
    OwnerProcess(name).EndAsOwner();
    EXPECT_THAT([&] { mutex.TryLock(1000); },
                ThrowsMessage<Exceptions::InvalidArgumentException>(StrEq("invalid mutex")));
    OwnerProcess next(name);  // takes it at once: it was given back
    next.EndAfterUnlocking();
    EXPECT_TRUE(mutex.TryLock(1000));
    mutex.Unlock();
}

}  // namespace
}  // namespace Varnholt::Utilities::Multithreading
