#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <ostream>
#include <utility>

#include "Platform/ErrorCodes.h"
#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform {

inline void PrintTo(WaitResult result, std::ostream* stream) {
    *stream << (result == WaitResult::Signalled   ? "Signalled"
                : result == WaitResult::Abandoned ? "Abandoned"
                : result == WaitResult::TimedOut  ? "TimedOut"
                                                  : "Failed");
}

/// Longer than any wait that ought to succeed; a test that fails must still end.
inline constexpr std::uint32_t LongTimeout = 20'000;

/// The code that a call set which did not succeed; the next one must set its own.
inline ErrorCode ErrorOf(bool succeeded) {
    const ErrorCode code = LastError();
    SetLastError(Errors::Success);
    return succeeded ? Errors::Success : code;
}
inline std::pair<WaitResult, std::size_t> Outcome(const WaitAnyResult& result) {
    return {result.result, result.index};
}

/// A platform thread with a closure as its body; seen to its end by the destructor.
class TestThread final {
  public:
    explicit TestThread(std::function<void()> threadBody)
        : body_(std::move(threadBody)), handle_(StartThread(Run, this)) {
        EXPECT_TRUE(handle_);
    }
    ~TestThread() { Join(); }

    void Join() {
        if (handle_) {
            EXPECT_EQ(Wait(handle_.Get(), LongTimeout), WaitResult::Signalled) << "the thread does not end";
            EXPECT_EQ(Wait(handle_.Get(), 0), WaitResult::Signalled) << "its end is for good";
            handle_.Reset();
        }
    }
    bool HasEnded() const { return Wait(handle_.Get(), 0) == WaitResult::Signalled; }
    Handle Get() const { return handle_.Get(); }

  private:
    static std::uint32_t Run(void* argument) {
        static_cast<TestThread*>(argument)->body_();
        return 0;
    }

    const std::function<void()> body_;
    OwnedHandle handle_;
};

}  // namespace Varnholt::Platform
