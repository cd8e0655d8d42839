#include "Platform/CallFilter.h"

#include <atomic>
#include <memory>
#include <mutex>
#include <utility>

namespace Varnholt::Platform {
namespace {

std::atomic<bool> isInstalled = false;  // calls that nobody filters take no lock
std::mutex filterLock;                  // guards what follows
std::shared_ptr<CallFilter> installedFilter;

std::shared_ptr<CallFilter> InstalledFilter() {
    const std::lock_guard lock(filterLock);
    return installedFilter;
}

}  // namespace

void InstallCallFilter(CallFilter filter) {
    const std::lock_guard lock(filterLock);
    isInstalled = static_cast<bool>(filter);
    installedFilter = filter ? std::make_shared<CallFilter>(std::move(filter)) : nullptr;
}

bool CallMustFail(std::string_view call) {
    if (!isInstalled.load(std::memory_order_relaxed)) {
        return false;
    }
    const std::shared_ptr<CallFilter> filter = InstalledFilter();
    const ErrorCode code = filter ? (*filter)(call) : Errors::Success;
    if (code == Errors::Success) {
        return false;
    }
    SetLastError(code);
    return true;
}

}  // namespace Varnholt::Platform
