#include "Platform/Usb/LibUsbEvents.h"

#include <libusb-1.0/libusb.h>

#include <algorithm>

#include "Platform/Posix/HostSignalsBlocked.h"

namespace Varnholt::Platform::Usb {
namespace {

using std::chrono::steady_clock;

/// How long after a waiting thread has handled events the own thread leaves them to the next wait. What ends
/// while nobody waits is noticed that much later.
constexpr auto Patience = std::chrono::milliseconds(10);

/// The longest stay in libusb; who waits comes back.
constexpr auto LongestStay = std::chrono::seconds(60);

}  // namespace

LibUsbEvents::LibUsbEvents(libusb_context* ownContext) : context(ownContext) {
    const Posix::HostSignalsBlocked blocked;
    thread = std::thread([this] { RunThread(); });
}

void LibUsbEvents::RunThread() {
    std::unique_lock lock(mutex);
    while (!stopping) {
        if (!handlesAlways && waiterHandles) {
            const auto isLeft = [this] { return !waiterHandles || handlesAlways || stopping; };
            if (!changed.wait_for(lock, Patience, isLeft)) {  // who waits briefly need not wake this thread
                threadAwaitsWaiter = true;
                changed.wait(lock, isLeft);
                threadAwaitsWaiter = false;
            }
            continue;
        }
        if (!handlesAlways && steady_clock::now() < leftToWaiters) {
            changed.wait_until(lock, leftToWaiters);
            continue;
        }
        threadHandles = true;
        lock.unlock();
        libusb_handle_events(context);
        lock.lock();
        threadHandles = false;
    }
}

void LibUsbEvents::HandleNow() {
    const std::lock_guard lock(mutex);
    leftToWaiters = {};
    changed.notify_all();
}

void LibUsbEvents::HandleAlways() {
    const std::lock_guard lock(mutex);
    handlesAlways = true;
    changed.notify_all();
}

void LibUsbEvents::Stop() {
    std::unique_lock lock(mutex);
    if (stopping) {
        return;
    }
    stopping = true;
    changed.notify_all();
    libusb_interrupt_event_handler(context);
    changed.wait(lock, [this] { return !waiterHandles; });
    lock.unlock();
    thread.join();
}

bool LibUsbEvents::TryEnter() {
    const std::lock_guard lock(mutex);
    if (waiterHandles || handlesAlways || stopping) {
        return false;
    }
    waiterHandles = true;
    interrupted = 0;
    return true;
}

void LibUsbEvents::WorkOff(Posix::Microseconds deadline) {
    const Posix::Microseconds now = Posix::CurrentClock().Now();
    const auto longest = static_cast<Posix::Microseconds>(std::chrono::microseconds(LongestStay).count());
    const Posix::Microseconds stay = std::min(deadline > now ? deadline - now : 0, longest);
    timeval time{};
    time.tv_sec = static_cast<time_t>(stay / 1'000'000);
    time.tv_usec = static_cast<suseconds_t>(stay % 1'000'000);
    {
        const std::lock_guard lock(mutex);
        if (threadHandles) {
            libusb_interrupt_event_handler(context);  // makes room; libusb waits for that
        }
    }
    libusb_handle_events_timeout_completed(context, &time, &interrupted);

    const std::lock_guard lock(mutex);
    waiterHandles = false;
    leftToWaiters = steady_clock::now() + Patience;
    if (stopping || handlesAlways || threadAwaitsWaiter) {
        changed.notify_all();
    }
}

void LibUsbEvents::Interrupt() {
    const std::lock_guard lock(mutex);
    interrupted = 1;
    if (!stopping) {
        libusb_interrupt_event_handler(context);
    }
}

}  // namespace Varnholt::Platform::Usb
