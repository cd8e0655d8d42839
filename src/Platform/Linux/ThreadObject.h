#pragma once

#include <pthread.h>

#include <atomic>

#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

/// A thread of `StartThread`; signalled for good once its entry has returned. The system's thread is joined
/// by whoever learns of that first, so that none of this library's code runs any more once a wait has said
/// so.
class ThreadObject final : public WaitableObject {
  public:
    ~ThreadObject() override {
        // The last reference is often the thread's own.
        if (!joined_ && pthread_equal(thread, pthread_self())) {
            pthread_detach(thread);
        } else {
            AfterWait();
        }
    }

    Taken TryTake(ThreadRecord& /*taker*/) override { return ended_ ? Taken::Yes : Taken::No; }
    ErrorCode Signal(ThreadRecord& /*signaller*/) override { return Errors::InvalidHandle; }
    void AfterWait() final {
        if (!joined_.exchange(true)) {
            pthread_join(thread, nullptr);
        }
    }
    std::string Describe() const override { return "the end of thread " + std::to_string(number); }

    /// Of the new thread itself, before it ends.
    void End() {
        ended_ = true;
        OfferToWaiters();
    }

    pthread_t thread{};
    std::uint32_t number = 0;
    /// There is a thread of the system behind the object. Of its maker, before others know of it.
    void MustBeJoined() { joined_ = false; }

  private:
    bool ended_ = false;  // guarded by the dispatcher lock
    std::atomic<bool> joined_ = true;
};

}  // namespace Varnholt::Platform::Linux
