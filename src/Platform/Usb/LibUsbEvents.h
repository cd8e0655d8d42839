#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <thread>

#include "Platform/CompletionSource.h"

struct libusb_context;

namespace Varnholt::Platform::Usb {

/// Handles the events of one libusb context: on a thread of its own, or on one that waits for a transfer.
/// Only this object handles them, so that nobody else takes libusb's lock of events.
class LibUsbEvents final : public CompletionSource {
  public:
    /// Throws std::system_error when no thread can be had. The context outlives the object's `Stop`.
    /// `patience` is how long after a waiting thread has handled events the own thread leaves them to the
    /// next wait: what ends while nobody waits is noticed that much later.
    explicit LibUsbEvents(libusb_context* ownContext,
                          std::chrono::milliseconds patience = std::chrono::milliseconds(10));
    ~LibUsbEvents() override { Stop(); }
    LibUsbEvents(const LibUsbEvents&) = delete;
    LibUsbEvents& operator=(const LibUsbEvents&) = delete;

    /// The own thread takes up the events at once, unless a waiting thread handles them: an aborted transfer
    /// is not always waited for in a way that handles events.
    void HandleNow();
    /// The own thread no longer leaves the events to threads that may wait.
    void HandleAlways();
    /// Returns once no thread handles events, and none will.
    void Stop();

    bool TryBegin() override;
    void HandleEvents(std::uint64_t deadline) override;
    void Interrupt() override;

  private:
    using Time = std::chrono::steady_clock::time_point;
    void RunThread();

    libusb_context* const context_;
    const std::chrono::milliseconds patience_;
    int interrupted_ = 0;  ///< read by libusb as well, between its own lock and its wait

    std::mutex mutex_;  ///< guards what follows
    std::condition_variable changed_;
    bool threadHandles_ = false;
    bool waiterHandles_ = false;
    bool threadAwaitsWaiter_ = false;  ///< the own thread sleeps until the waiting thread leaves
    Time leftToWaiters_{};             ///< the own thread sleeps until then
    bool handlesAlways_ = false;
    bool stopping_ = false;

    std::thread thread_;
};

}  // namespace Varnholt::Platform::Usb
