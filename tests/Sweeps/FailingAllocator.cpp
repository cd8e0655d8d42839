#include "Sweeps/FailingAllocator.h"

#include <atomic>
#include <cstdlib>
#include <new>

namespace {

/// Allocations until the one that fails; 0 while none is to fail.
std::atomic<long> untilFailure = 0;
std::atomic<bool> hasFailed = false;
thread_local int exempt = 0;

bool MustFail() {
    if (exempt != 0 || untilFailure.load(std::memory_order_relaxed) == 0) {
        return false;
    }
    if (untilFailure.fetch_sub(1) == 1) {
        hasFailed = true;
        return true;
    }
    return false;
}

void* Allocate(std::size_t size) {
    return MustFail() ? nullptr : std::malloc(size == 0 ? 1 : size);
}

}  // namespace

// The forms for arrays stand on these, but for sanitizers, which have theirs.
void* operator new(std::size_t size) {
    if (void* const memory = Allocate(size)) {
        return memory;
    }
    throw std::bad_alloc();
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    return Allocate(size);
}
void operator delete(void* memory) noexcept {
    std::free(memory);
}
void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace Varnholt::Tests {

Exempt::Exempt() {
    ++exempt;
}

Exempt::~Exempt() {
    --exempt;
}

void FailAllocation(long number) {
    hasFailed = false;
    untilFailure = number;
}

bool StopFailing() {
    untilFailure = 0;
    return hasFailed;
}

}  // namespace Varnholt::Tests
