#include <mutex>
#include <utility>

#include "Platform/HostQueries.h"
#include "Platform/Time.h"

namespace Varnholt::Platform {
namespace {

std::optional<VersionRecord> versionOverride;
std::optional<bool> hostOverride;

std::mutex observerLock;
BeepObserver beepObserver;  // guarded by observerLock

BeepObserver InstalledObserver() {
    const std::lock_guard held(observerLock);
    return beepObserver;
}

}  // namespace

VersionRecord ReadVersionRecord() {
    return versionOverride ? *versionOverride : ReadSystemVersion();
}

void OverrideVersionRecord(std::optional<VersionRecord> record) {
    versionOverride = std::move(record);
}

void Override64BitHost(std::optional<bool> answer) {
    hostOverride = answer;
}

std::optional<bool> Overridden64BitHost() {
    return hostOverride;
}

void Beep(std::uint32_t hertz, std::uint32_t milliseconds) {
    if (const BeepObserver observer = InstalledObserver()) {
        observer(hertz, milliseconds);
    } else {
        SoundSystemBeep(hertz, milliseconds);
    }
}

void ObserveBeeps(BeepObserver observer) {
    const std::lock_guard held(observerLock);
    beepObserver = std::move(observer);
}

}  // namespace Varnholt::Platform
