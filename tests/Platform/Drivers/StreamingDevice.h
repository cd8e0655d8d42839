#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <mutex>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "Platform/EventScheduler.h"
#include "Platform/Usb/UsbDevice.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Tests {

/// Delivers an endless stream whose bytes tell their place, so that one that is lost or counted twice shows.
/// Some transfers complete as they are submitted; cancellations come from any thread and may carry data, as
/// on a real host controller. When the others complete is the derived classes' matter.
class StreamingDevice : public Platform::Usb::UsbDevice {
  public:
    /// The byte at a place of the stream.
    static std::uint8_t ByteAt(std::uint64_t place) { return static_cast<std::uint8_t>(place * 7); }

    explicit StreamingDevice(unsigned seed) : random(seed) {}
    ~StreamingDevice() override { EXPECT_TRUE(pending.empty()); }

    std::vector<Platform::Usb::EndpointInfo> Endpoints() override {
        return {{Protocol::BulkInEndpoint, 2, 512}};
    }
    Platform::ErrorCode Claim() override { return Platform::Errors::Success; }
    void Release() override {}
    Platform::ErrorCode ClearHalt(std::uint8_t) override { return Platform::Errors::Success; }

    Platform::ErrorCode Submit(Platform::Usb::Transfer& transfer) override {
        bool completesAtOnce = false;
        {
            const std::lock_guard guard(lock);
            completesAtOnce = random() % 8 == 0 && pending.empty();
            if (completesAtOnce) {
                Fill(transfer, transfer.length, Platform::Usb::TransferStatus::Completed);
            } else {
                pending.push_back(&transfer);
            }
        }
        if (completesAtOnce) {
            transfer.client->TransferCompleted(transfer);
        } else {
            Accepted();
        }
        return Platform::Errors::Success;
    }

    void Cancel(Platform::Usb::Transfer& transfer) override {
        {
            const std::lock_guard guard(lock);
            const auto found = std::find(pending.begin(), pending.end(), &transfer);
            if (found == pending.end()) {
                return;
            }
            // Only the oldest transfer of an endpoint can have got data.
            const auto moved = found == pending.begin() ? Random(transfer.length + 1) : 0;
            pending.erase(found);
            Fill(transfer, moved, Platform::Usb::TransferStatus::Cancelled);
        }
        transfer.client->TransferCompleted(transfer);
    }

    /// Bytes given away so far.
    std::uint64_t Delivered() {
        const std::lock_guard guard(lock);
        return delivered;
    }

  protected:
    /// A transfer waits to be completed. Called without the lock.
    virtual void Accepted() = 0;

    void CompleteOldest() {
        Platform::Usb::Transfer* oldest = nullptr;
        {
            const std::lock_guard guard(lock);
            if (pending.empty()) {
                return;
            }
            oldest = pending.front();
            pending.pop_front();
            Fill(*oldest, oldest->length, Platform::Usb::TransferStatus::Completed);
        }
        oldest->client->TransferCompleted(*oldest);
    }

    std::uint32_t Random(std::uint32_t limit) { return static_cast<std::uint32_t>(random() % limit); }

    std::mutex lock;  // guards what follows; not held while others are called
    std::minstd_rand random;
    std::deque<Platform::Usb::Transfer*> pending;

  private:
    void Fill(Platform::Usb::Transfer& transfer, std::uint32_t count, Platform::Usb::TransferStatus status) {
        std::generate_n(transfer.data, count, [this] { return ByteAt(delivered++); });
        transfer.actualLength = count;
        transfer.status = status;
    }

    std::uint64_t delivered = 0;
};

/// Completes transfers on a thread of its own, as fast as it gets to it.
class ThreadedStreamingDevice final : public StreamingDevice {
  public:
    explicit ThreadedStreamingDevice(unsigned seed) : StreamingDevice(seed), worker([this] { Run(); }) {}
    ~ThreadedStreamingDevice() override {
        {
            const std::lock_guard guard(lock);
            ending = true;
        }
        changed.notify_all();
        worker.join();
    }

  private:
    void Accepted() override { changed.notify_all(); }

    void Run() {
        for (;;) {
            std::uint32_t pause = 0;
            {
                std::unique_lock hold(lock);
                changed.wait(hold, [this] { return ending || !pending.empty(); });
                if (pending.empty()) {
                    return;
                }
                pause = Random(64);
            }
            for (std::uint32_t i = 0; i < pause; ++i) {
                std::this_thread::yield();
            }
            CompleteOldest();
        }
    }

    std::condition_variable changed;
    bool ending = false;  // guarded by `lock`
    std::thread worker;
};

/// Completes transfers as events of the clock, so that virtual time decides the order.
class ScheduledStreamingDevice final : public StreamingDevice {
  public:
    explicit ScheduledStreamingDevice(unsigned seed) : StreamingDevice(seed) {}
    ~ScheduledStreamingDevice() override {
        for (const auto event : events) {
            Platform::ClockScheduler().Forget(event);
        }
    }

  private:
    void Accepted() override {
        std::uint64_t delay = 0;
        {
            const std::lock_guard guard(lock);
            delay = Random(6);
        }
        auto& scheduler = Platform::ClockScheduler();
        const auto event = scheduler.CallAt(scheduler.Now() + delay, [this] { CompleteOldest(); });
        const std::lock_guard guard(lock);
        events.push_back(event);
    }

    std::vector<std::uint64_t> events;  // guarded by `lock`
};

template <class Device>
class StreamingBus final : public Platform::Usb::UsbBus {
  public:
    explicit StreamingBus(unsigned seed) : device(std::make_shared<Device>(seed)) {}
    const std::shared_ptr<Device> device;
    std::vector<std::string> List() override { return {"port1"}; }
    std::shared_ptr<Platform::Usb::UsbDevice> Open(const std::string&, Platform::ErrorCode&) override {
        return device;
    }
};

}  // namespace Varnholt::Tests
