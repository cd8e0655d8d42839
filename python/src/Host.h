#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "Capture/PcapngWriter.h"
#include "Capture/UsbCapture.h"
#include "Platform/DeviceFiles.h"
#include "Platform/Usb/UsbDevice.h"
#include "SchedulerInForce.h"
#include "Service/InterruptibleDeviceFiles.h"
#include "SimulatedBus.h"
#include "VirtualClock.h"

namespace Varnholt::Python {

/// What all instruments of this process stand on: the system's bus and the simulated instruments beside it,
/// recordings of the traffic, and the virtual clock where there is one. Lives as long as the process. Any
/// thread, without the interpreter's lock.
class Host final {
  public:
    static Host& Instance();

    /// `Failure` where instruments cannot be used: in a process that was forked from one that used them, and
    /// under virtual time on any thread but the clock's own.
    void CheckUsable() const;
    bool IsUsable() const;
    bool IsForked() const;
    bool IsTimeVirtual() const;
    Service::InterruptibleDeviceFiles& Files() { return interruptible_; }

    /// An instrument that is open, for its life.
    class Use final {
      public:
        Use() { ++Instance().uses_; }
        ~Use() { --Instance().uses_; }
        Use(const Use&) = delete;
        Use& operator=(const Use&) = delete;
    };

    /// Plugs in a simulated instrument, and makes time virtual if that is wanted. Answers its name on the
    /// bus.
    std::string AddSimulated(const std::string& name, Simulator::InstrumentSettings settings,
                             bool withVirtualTime);
    void RemoveSimulated(const std::string& name);
    Simulator::SimulatedBus& Simulated() { return simulated_; }
    double VirtualSeconds() const;

    /// Every device opened from now on is recorded, until it is closed. `Failure` when there is one already.
    void StartCapture(const std::string& file);
    /// `Failure` when something could not be written.
    void EndCapture();

  private:
    Host();

    class Bus final : public Platform::Usb::UsbBus {
      public:
        explicit Bus(Host& owner) : host_(owner) {}
        std::vector<std::string> List() override;
        bool Has(const std::string& name) override;
        std::shared_ptr<Platform::Usb::UsbDevice> Open(const std::string& name,
                                                       Platform::ErrorCode& error) override;

      private:
        Platform::Usb::UsbBus& BusOf(const std::string& name);
        Host& host_;
    };

    Simulator::SchedulerInForce scheduler_;
    Simulator::SimulatedBus simulated_{scheduler_};
    Bus bus_{*this};
    const std::unique_ptr<Platform::DeviceFileSystem> files_;
    Service::InterruptibleDeviceFiles interruptible_{*files_};
    const Platform::ScopedDeviceFiles inForce_{interruptible_};

    std::atomic<int> uses_{0};
    std::atomic<bool> isTimeVirtual_{false};
    mutable std::mutex mutex_;  // guards what follows
    std::set<std::string> names_;
    std::optional<Simulator::VirtualClock> clock_;
    std::thread::id clockThread_;
    std::string captureFile_;
    std::shared_ptr<Capture::PcapngWriter> capture_;
    std::uint8_t captured_ = 0;
};

}  // namespace Varnholt::Python
