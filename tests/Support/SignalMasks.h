#pragma once

#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <string>
#include <thread>

namespace Varnholt::Tests {

/// What each thread of this process blocks, but for the calling one.
inline std::map<std::string, std::uint64_t> MasksOfOtherThreads() {
    std::map<std::string, std::uint64_t> masks;
    for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
        std::ifstream file(task.path() / "status");
        const std::string status{std::istreambuf_iterator<char>(file), {}}, name = "SigBlk:";
        const std::size_t mask = status.find(name);
        // A thread that ends meanwhile has no status any more, or one that counts no threads and tells no
        // mask.
        if (task.path().filename() != std::to_string(gettid()) && mask != std::string::npos &&
            status.find("Threads:\t0\n") == std::string::npos) {
            masks[task.path().filename()] = std::stoull(status.substr(mask + name.size()), nullptr, 16);
        }
    }
    return masks;
}

/// Every thread of this process but the caller's takes none of the signals that a host may handle, and all
/// that report a fault of its own. There must be such a thread. Skipped where the thread sanitizer has one.
inline void ExpectOtherThreadsBlockHostSignals() {
#if defined(__SANITIZE_THREAD__)
    GTEST_SKIP() << "the sanitizer's own thread blocks all signals";
#endif
    std::uint64_t ofHosts = 0, ofFaults = 0;
    for (const int number : {SIGHUP, SIGINT, SIGQUIT, SIGUSR1, SIGUSR2, SIGPIPE, SIGALRM, SIGTERM, SIGCHLD,
                             SIGPROF, SIGWINCH, SIGIO, SIGRTMIN, SIGRTMAX}) {
        ofHosts |= std::uint64_t{1} << (number - 1);
    }
    for (const int number : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGABRT}) {
        ofFaults |= std::uint64_t{1} << (number - 1);
    }
    auto masks = MasksOfOtherThreads();
    // The system blocks every signal while a thread begins.
    const auto begins = [ofFaults](const auto& thread) { return (thread.second & ofFaults) == ofFaults; };
    for (int look = 0; look < 20'000 && std::ranges::any_of(masks, begins); ++look) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
        masks = MasksOfOtherThreads();
    }
    EXPECT_FALSE(masks.empty());
    for (const auto& [thread, mask] : masks) {
        EXPECT_EQ(mask & (ofHosts | ofFaults), ofHosts) << "thread " << thread;
    }
}

}  // namespace Varnholt::Tests
