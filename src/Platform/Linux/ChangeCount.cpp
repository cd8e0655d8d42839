#include <linux/futex.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <ctime>
#include <limits>

#include "Platform/Linux/SharedContent.h"

namespace Varnholt::Platform::Linux {

static_assert(std::atomic_ref<std::uint32_t>::is_always_lock_free,
              "a process that dies must not keep a lock");

std::uint32_t ChangeCount::Get() const {
    return std::atomic_ref(changes_).load();
}

void ChangeCount::Increment() {
    ++std::atomic_ref(changes_);
    if (std::atomic_ref(sleepers_).load() != 0) {
        syscall(SYS_futex, &changes_, FUTEX_WAKE, std::numeric_limits<int>::max(), nullptr, nullptr, 0);
    }
}

void ChangeCount::Await(std::uint32_t seen, Microseconds limit) {
    const timespec timeout{static_cast<time_t>(limit / 1'000'000),
                           static_cast<long>(limit % 1'000'000 * 1000)};
    ++std::atomic_ref(sleepers_);
    syscall(SYS_futex, &changes_, FUTEX_WAIT, seen, &timeout, nullptr, 0);
    --std::atomic_ref(sleepers_);
}

}  // namespace Varnholt::Platform::Linux
