#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "Platform/Linux/SharedContent.h"
#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

struct SemaphoreContent : Header<SemaphoreContent> {
    static constexpr std::uint64_t Version = 0x101;
    std::int32_t maximum = 0;
    std::int32_t available = 0;  // only through `std::atomic_ref`

    static bool Initialise() { return true; }
    bool IsValid() const { return Header::IsValid() && maximum > 0; }
};

/// A counting semaphore.
class SemaphoreObject final : public WaitableObject {
  public:
    /// This process's own.
    SemaphoreObject(std::int32_t initialCount, std::int32_t maximumCount);
    /// One whose count all processes of the user share.
    explicit SemaphoreObject(std::unique_ptr<SharedFile> opened);
    /// The one of this name, as `MutexObject::Open`; the counts are those of the first that opens it.
    static std::shared_ptr<SemaphoreObject> Open(std::int32_t initialCount, std::int32_t maximumCount,
                                                 const std::string& name);

    Taken TryTake(ThreadRecord& taker) override;
    ErrorCode Signal(ThreadRecord& signaller) override;
    bool IsHeldElsewhere() const override { return file_ != nullptr; }
    std::string Describe() const override { return "a semaphore"; }

    /// `Errors::TooManyPosts` when the count would pass its maximum; it is then left as it was.
    ErrorCode Release(std::int32_t count);

  private:
    const std::unique_ptr<SharedFile> file_;
    SemaphoreContent own_;  ///< where there is no file
    SemaphoreContent& content_;
};

}  // namespace Varnholt::Platform::Linux
