#pragma once

#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <string>
#include <thread>

namespace Varnholt::Tests {

inline bool Blocks(std::uint64_t mask, int number) {
    return (mask >> (number - 1) & 1) != 0;
}

/// What each thread of this process blocks, but for the calling one.
inline std::map<std::string, std::uint64_t> MasksOfOtherThreads() {
    std::map<std::string, std::uint64_t> masks;
    for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
        std::ifstream status(task.path() / "status");
        std::string word;
        while (status >> word && word != "SigBlk:") {
        }
        std::uint64_t mask = 0;
        if (task.path().filename() != std::to_string(gettid()) && status >> std::hex >> mask) {
            masks[task.path().filename()] = mask;
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
    auto masks = MasksOfOtherThreads();
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    // The system blocks every signal while a thread begins.
    const auto begins = [](const auto& thread) { return Blocks(thread.second, SIGSEGV); };
    while (std::ranges::any_of(masks, begins) && std::chrono::steady_clock::now() < end) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
        masks = MasksOfOtherThreads();
    }
    EXPECT_FALSE(masks.empty());
    for (const auto& [thread, mask] : masks) {
        SCOPED_TRACE("thread " + thread);
        for (const int number : {SIGHUP, SIGINT, SIGQUIT, SIGUSR1, SIGUSR2, SIGPIPE, SIGALRM, SIGTERM,
                                 SIGCHLD, SIGPROF, SIGWINCH, SIGIO, SIGRTMIN, SIGRTMAX}) {
            EXPECT_TRUE(Blocks(mask, number)) << strsignal(number);
        }
        for (const int number : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGABRT}) {
            EXPECT_FALSE(Blocks(mask, number)) << strsignal(number);
        }
    }
}

}  // namespace Varnholt::Tests
