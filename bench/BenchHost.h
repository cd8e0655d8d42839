#pragma once

#include <memory>
#include <optional>
#include <utility>

#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/EventScheduler.h"
#include "Platform/HostQueries.h"
#include "Platform/Time.h"
#include "SimulatedBus.h"
#include "Timing.h"

namespace Varnholt::Bench {

/// A simulated instrument that the library reaches over USBIO, or over its own driver.
class BenchHost final {
  public:
    BenchHost(bool overUsbIo, Simulator::InstrumentSettings settings) {
        Platform::Override64BitHost(overUsbIo);
        Platform::ObserveBeeps([](std::uint32_t, std::uint32_t) {});
        bus_.Add("bench", std::move(settings));
    }
    ~BenchHost() {
        Platform::ObserveBeeps({});
        Platform::Override64BitHost(std::nullopt);
    }
    BenchHost(const BenchHost&) = delete;
    BenchHost& operator=(const BenchHost&) = delete;

    std::shared_ptr<Platform::Usb::UsbDevice> Open() {
        Platform::ErrorCode error = 0;
        return bus_.Open("bench", error);
    }

  private:
    Simulator::SimulatedBus bus_{Platform::ClockScheduler()};
    const std::unique_ptr<Platform::DeviceFileSystem> files_ = Platform::Drivers::MakeDriverFileSystem(bus_);
    const Platform::ScopedDeviceFiles inForce_{*files_};
};

}  // namespace Varnholt::Bench
