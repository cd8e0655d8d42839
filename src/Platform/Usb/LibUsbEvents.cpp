#include "Platform/Usb/LibUsbEvents.h"

#include <libusb-1.0/libusb.h>

#include <algorithm>

#include "Platform/EventScheduler.h"
#include "Platform/Linux/HostSignalsBlocked.h"

namespace Varnholt::Platform::Usb {
namespace {

using std::chrono::steady_clock;

/// The longest stay in libusb; who waits comes back.
constexpr auto LongestStay = std::chrono::seconds(60);

}  // namespace

LibUsbEvents::LibUsbEvents(libusb_context* ownContext, std::chrono::milliseconds patience)
    : context_(ownContext), patience_(patience) {
    const Linux::HostSignalsBlocked blocked;
    thread_ = std::thread([this] { RunThread(); });
}

void LibUsbEvents::RunThread() {
    std::unique_lock lock(mutex_);
    while (!stopping_) {
        if (waiterHandles_) {
            const auto hasLeft = [this] { return !waiterHandles_; };
            if (!changed_.wait_for(lock, patience_, hasLeft)) {  // a brief wait need not wake this thread
                threadAwaitsWaiter_ = true;
                changed_.wait(lock, hasLeft);
                threadAwaitsWaiter_ = false;
            }
            continue;
        }
        if (!handlesAlways_ && steady_clock::now() < leftToWaiters_) {
            changed_.wait_until(lock, leftToWaiters_);
            continue;
        }
        threadHandles_ = true;
        lock.unlock();
        libusb_handle_events(context_);
        lock.lock();
        threadHandles_ = false;
    }
}

void LibUsbEvents::HandleNow() {
    const std::lock_guard lock(mutex_);
    leftToWaiters_ = {};
    changed_.notify_all();
}

void LibUsbEvents::HandleAlways() {
    const std::lock_guard lock(mutex_);
    handlesAlways_ = true;
    changed_.notify_all();
}

void LibUsbEvents::Stop() {
    std::unique_lock lock(mutex_);
    if (stopping_) {
        return;
    }
    stopping_ = true;
    interrupted_ = 1;  // for who is still on the way there
    changed_.notify_all();
    libusb_interrupt_event_handler(context_);
    changed_.wait(lock, [this] { return !waiterHandles_; });
    lock.unlock();
    thread_.join();
}

bool LibUsbEvents::TryBegin() {
    const std::lock_guard lock(mutex_);
    if (waiterHandles_ || handlesAlways_ || stopping_) {
        return false;
    }
    waiterHandles_ = true;
    interrupted_ = 0;
    return true;
}

void LibUsbEvents::HandleEvents(std::uint64_t deadline) {
    const std::uint64_t now = ClockScheduler().Now();
    const auto longest = static_cast<std::uint64_t>(std::chrono::microseconds(LongestStay).count());
    const std::uint64_t stay = std::min(deadline > now ? deadline - now : 0, longest);
    timeval time{};
    time.tv_sec = static_cast<time_t>(stay / 1'000'000);
    time.tv_usec = static_cast<suseconds_t>(stay % 1'000'000);
    {
        const std::lock_guard lock(mutex_);
        if (threadHandles_) {
            libusb_interrupt_event_handler(context_);  // makes room; libusb waits for that
        }
    }
    libusb_handle_events_timeout_completed(context_, &time, &interrupted_);

    const std::lock_guard lock(mutex_);
    waiterHandles_ = false;
    leftToWaiters_ = steady_clock::now() + patience_;
    if (stopping_ || handlesAlways_ || threadAwaitsWaiter_) {
        changed_.notify_all();
    }
}

void LibUsbEvents::Interrupt() {
    const std::lock_guard lock(mutex_);
    interrupted_ = 1;
    if (!stopping_) {
        libusb_interrupt_event_handler(context_);
    }
}

}  // namespace Varnholt::Platform::Usb
