#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <utility>

#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"
#include "Printing.h"

namespace Varnholt::Platform {

/// Longer than any wait that ought to succeed; a test that fails must still end.
inline constexpr std::uint32_t LongTimeout = 20'000;

/// A platform thread with a closure as its body; seen to its end by the destructor.
class TestThread final {
  public:
    explicit TestThread(std::function<void()> threadBody)
        : body(std::move(threadBody)), handle(StartThread(Run, this)) {
        EXPECT_TRUE(handle);
    }
    ~TestThread() { Join(); }
    TestThread(const TestThread&) = delete;
    TestThread& operator=(const TestThread&) = delete;

    void Join() {
        if (handle) {
            EXPECT_EQ(Wait(handle.Get(), LongTimeout), WaitResult::Signalled) << "the thread does not end";
            handle.Reset();
        }
    }
    Handle Get() const { return handle.Get(); }

  private:
    static std::uint32_t Run(void* argument) {
        static_cast<TestThread*>(argument)->body();
        return 0;
    }

    const std::function<void()> body;
    OwnedHandle handle;
};

}  // namespace Varnholt::Platform
