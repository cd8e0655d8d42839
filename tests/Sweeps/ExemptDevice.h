#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <utility>
#include <vector>

#include "Platform/EventScheduler.h"
#include "Platform/Threads.h"
#include "Platform/Usb/UsbDevice.h"
#include "Platform/WaitableObjects.h"
#include "Sweeps/FailingAllocator.h"

namespace Varnholt::Tests {

/// A device whose own allocations do not fail.
class ExemptDevice final : public Platform::Usb::UsbDevice {
  public:
    explicit ExemptDevice(std::shared_ptr<Platform::Usb::UsbDevice> behind) : device_(std::move(behind)) {}
    ~ExemptDevice() override {
        const Exempt guard;
        device_.reset();
    }
    std::vector<Platform::Usb::EndpointInfo> Endpoints(Platform::ErrorCode& error) override {
        return device_->Endpoints(error);
    }
    Platform::ErrorCode Claim() override {
        const Exempt guard;
        return device_->Claim();
    }
    void Release() override {
        const Exempt guard;
        device_->Release();
    }
    Platform::ErrorCode Submit(Platform::Usb::Transfer& transfer) override {
        const Exempt guard;
        return device_->Submit(transfer);
    }
    void Cancel(Platform::Usb::Transfer& transfer) override {
        const Exempt guard;
        device_->Cancel(transfer);
    }
    Platform::ErrorCode ClearHalt(std::uint8_t endpoint) override {
        const Exempt guard;
        return device_->ClearHalt(endpoint);
    }

  private:
    std::shared_ptr<Platform::Usb::UsbDevice> device_;
};

/// The virtual clock makes a thread when an event comes while a lock is held; that one is not to be counted.
inline void StartTheClocksOwnThread() {
    Platform::RecursiveMutex section;
    const std::lock_guard held(section);
    Platform::ClockScheduler().CallAt(Platform::ClockScheduler().Now() + 1, [] {});
    Platform::SleepMilliseconds(1);
}

}  // namespace Varnholt::Tests
