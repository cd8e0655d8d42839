#include "Platform/Linux/SemaphoreObject.h"

#include <atomic>
#include <utility>

#include "Platform/Linux/NamedObjects.h"
#include "Platform/Linux/NoDestructor.h"

namespace Varnholt::Platform::Linux {
namespace {

SemaphoreContent ContentOf(std::int32_t initialCount, std::int32_t maximumCount) {
    SemaphoreContent content;
    content.maximum = maximumCount;
    content.available = initialCount;
    return content;
}

NoDestructor<NamedObjects<SemaphoreObject>> namedSemaphores;

}  // namespace

SemaphoreObject::SemaphoreObject(std::int32_t initialCount, std::int32_t maximumCount)
    : own_(ContentOf(initialCount, maximumCount)), content_(own_) {}

SemaphoreObject::SemaphoreObject(std::unique_ptr<SharedFile> opened)
    : WaitableObject(ContentIn<SemaphoreContent>(*opened).changes),
      file_(std::move(opened)),
      content_(ContentIn<SemaphoreContent>(*file_)) {}

std::shared_ptr<SemaphoreObject> SemaphoreObject::Open(std::int32_t initialCount, std::int32_t maximumCount,
                                                       const std::string& name) {
    return (*namedSemaphores).Open(name, [&] {
        if (CurrentClock().IsCooperative()) {
            return std::make_shared<SemaphoreObject>(initialCount, maximumCount);
        }
        auto file = OpenContent("semaphore", name, ContentOf(initialCount, maximumCount));
        return file ? std::make_shared<SemaphoreObject>(std::move(file)) : nullptr;
    });
}

WaitableObject::Taken SemaphoreObject::TryTake(ThreadRecord& /*taker*/) {
    const std::atomic_ref available(content_.available);
    std::int32_t count = available.load();
    while (count > 0) {
        if (available.compare_exchange_weak(count, count - 1)) {
            return Taken::Yes;
        }
    }
    return Taken::No;
}

ErrorCode SemaphoreObject::Signal(ThreadRecord& /*signaller*/) {
    return Release(1);
}

ErrorCode SemaphoreObject::Release(std::int32_t added) {
    if (added <= 0) {
        return Errors::InvalidParameter;
    }
    const std::atomic_ref available(content_.available);
    std::int32_t count = available.load();
    do {
        if (count < 0 || count > content_.maximum || added > content_.maximum - count) {
            return Errors::TooManyPosts;
        }
    } while (!available.compare_exchange_weak(count, count + added));
    content_.changes.Increment();
    OfferToWaiters();
    return Errors::Success;
}

}  // namespace Varnholt::Platform::Linux
