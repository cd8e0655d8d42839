#include "Platform/Linux/SharedSemaphore.h"

#include <atomic>

#include "Platform/Linux/SharedContent.h"

namespace Varnholt::Platform::Linux {
namespace {

struct SemaphoreContent {
    static constexpr std::uint64_t Version = 0x101;
    Header<SemaphoreContent> header;
    std::int32_t maximum;
    std::int32_t available;  // only through `std::atomic_ref`

    bool Initialise() {
        header = {};
        return true;
    }
    bool IsValid() const { return header.IsValid() && maximum > 0; }
};

class SharedSemaphore final : public SemaphoreObject {
  public:
    explicit SharedSemaphore(std::unique_ptr<SharedFile> opened)
        : file_(std::move(opened)), content_(*static_cast<SemaphoreContent*>(file_->Memory())) {}

    bool IsHeldElsewhere() const override { return true; }
    std::uint32_t Changes() const override { return content_.header.changes.Get(); }
    void AwaitChange(std::uint32_t seen, Microseconds limit) override {
        content_.header.changes.Await(seen, limit);
    }
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
        content_.header.changes.Increment();
        return true;
    }

    const std::unique_ptr<SharedFile> file_;
    SemaphoreContent& content_;
};

}  // namespace

std::shared_ptr<SemaphoreObject> OpenSharedSemaphore(std::int32_t initialCount, std::int32_t maximumCount,
                                                     const std::string& name) {
    const SemaphoreContent initial{.header = {}, .maximum = maximumCount, .available = initialCount};
    auto file = OpenContent("semaphore", name, initial);
    return file ? std::make_shared<SharedSemaphore>(std::move(file)) : nullptr;
}

}  // namespace Varnholt::Platform::Linux
