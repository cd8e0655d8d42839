#pragma once

#include <cstdint>

#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

/// A counting semaphore; the count's place differs between one process and several.
class SemaphoreObject : public WaitableObject {
  public:
    ErrorCode Signal(ThreadRecord& signaller) final;
    std::string Describe() const override { return "a semaphore"; }

    /// `Errors::TooManyPosts` when the count would pass its maximum; it is then left as it was.
    ErrorCode Release(std::int32_t count);

  private:
    virtual bool Add(std::int32_t count) = 0;
};

class LocalSemaphore final : public SemaphoreObject {
  public:
    LocalSemaphore(std::int32_t initialCount, std::int32_t maximumCount)
        : available_(initialCount), maximum_(maximumCount) {}

    Taken TryTake(ThreadRecord& taker) override;

  private:
    bool Add(std::int32_t count) override;

    std::int32_t available_;
    const std::int32_t maximum_;
};

}  // namespace Varnholt::Platform::Linux
