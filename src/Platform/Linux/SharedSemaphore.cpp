#include "Platform/Linux/SharedSemaphore.h"

#include <atomic>

#include "Platform/Linux/SharedContent.h"

namespace Varnholt::Platform::Linux {
namespace {

struct SemaphoreContent : Header<SemaphoreContent> {
    static constexpr std::uint64_t Version = 0x101;
    std::int32_t maximum = 0;
    std::int32_t available = 0;  // only through `std::atomic_ref`

    static bool Initialise() { return true; }
    bool IsValid() const { return Header::IsValid() && maximum > 0; }
};

class SharedSemaphore final : public SharedObject<SemaphoreObject, SemaphoreContent> {
  public:
    using SharedObject::SharedObject;

    Taken TryTake(ThreadRecord& /*taker*/) override {
        const std::atomic_ref available(content_.available);
        std::int32_t count = available.load();
        while (count > 0) {
            if (available.compare_exchange_weak(count, count - 1)) {
                return Taken::Yes;
            }
        }
        return Taken::No;
    }

  private:
    bool Add(std::int32_t added) override {
        const std::atomic_ref available(content_.available);
        std::int32_t count = available.load();
        do {
            if (count < 0 || count > content_.maximum || added > content_.maximum - count) {
                return false;
            }
        } while (!available.compare_exchange_weak(count, count + added));
        content_.changes.Increment();
        return true;
    }
};

}  // namespace

std::shared_ptr<SemaphoreObject> OpenSharedSemaphore(std::int32_t initialCount, std::int32_t maximumCount,
                                                     const std::string& name) {
    SemaphoreContent initial;
    initial.maximum = maximumCount;
    initial.available = initialCount;
    auto file = OpenContent("semaphore", name, initial);
    return file ? std::make_shared<SharedSemaphore>(std::move(file)) : nullptr;
}

}  // namespace Varnholt::Platform::Linux
