#include <atomic>
#include <cstdlib>
#include <list>
#include <mutex>

#include "Platform/Posix/Kernel.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Platform {

using namespace Posix;

namespace {

class EnteringSection final : public BlockedCall {
  public:
    EnteringSection(ThreadRecord& caller, const std::atomic<ThreadRecord*>& inside)
        : BlockedCall(caller), owner(inside) {}
    std::string Describe() const override {
        const ThreadRecord* const inside = owner.load();
        return inside ? "a critical section owned by thread " + std::to_string(inside->number)
                      : "a critical section";
    }

  private:
    const std::atomic<ThreadRecord*>& owner;
};

}  // namespace

struct CriticalSection::Impl {
    std::mutex lock;
    std::atomic<ThreadRecord*> owner = nullptr;
    unsigned depth = 0;  // of the owner only
};

CriticalSection::CriticalSection() : impl(std::make_unique<Impl>()) {}

CriticalSection::~CriticalSection() = default;

void CriticalSection::Enter() {
    ThreadRecord& me = CurrentThread();
    if (impl->owner.load(std::memory_order_relaxed) != &me) {
        impl->lock.lock();
        impl->owner.store(&me, std::memory_order_relaxed);
    }
    ++impl->depth;
}

void CriticalSection::Leave() {
    if (--impl->depth == 0) {
        impl->owner.store(nullptr, std::memory_order_relaxed);
        impl->lock.unlock();
    }
}

}  // namespace Varnholt::Platform
