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
    ~ThreadObject() override;

    Taken TryTake(ThreadRecord& taker) override;
    ErrorCode Signal(ThreadRecord& signaller) override;
    void AfterWait() override;
    std::string Describe() const override;

    /// Of the new thread itself, before it ends.
    void End();

    pthread_t thread{};
    std::uint32_t number = 0;
    /// There is a thread of the system behind the object. Of its maker, before others know of it.
    void MustBeJoined() { joined_ = false; }

  private:
    void JoinOnce();

    bool ended_ = false;  // guarded by the dispatcher lock
    std::atomic<bool> joined_ = true;
};

}  // namespace Varnholt::Platform::Linux
