#pragma once

#include <chrono>
#include <ctime>

namespace Varnholt::Bench {

/// How long an action takes.
template <class Action>
double Seconds(const Action& action) {
    const auto begin = std::chrono::steady_clock::now();
    action();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - begin).count();
}

/// Processor time of the whole process, all threads together.
inline double CpuSeconds() {
    timespec time{};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
}

}  // namespace Varnholt::Bench
