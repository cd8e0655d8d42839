#pragma once

#include <memory>

#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/EventScheduler.h"
#include "Platform/HostQueries.h"
#include "SimulatedBus.h"
#include "Support/Transport.h"

namespace Varnholt::Tests {

/// A host with simulated instruments on its bus: the library's device files are those of the driver behaviour
/// over the bus, and the host answers the 64-bit question so that the library uses the given transport.
class SimulatedHost final {
  public:
    explicit SimulatedHost(Transport transport) : path_(std::string(Name(transport)) + "/") {
        Platform::Override64BitHost(transport == Transport::UsbIo);
    }
    ~SimulatedHost() { Platform::Override64BitHost(std::nullopt); }

    Simulator::SimulatedBus& Bus() { return bus_; }
    Simulator::SimulatedInstrument& Add(const std::string& name,
                                        Simulator::InstrumentSettings settings = {}) {
        return bus_.Add(name, std::move(settings));
    }
    /// The identifier under which the library lists the instrument.
    std::string Identifier(const std::string& name) const { return path_ + name; }

  private:
    const std::string path_;
    Simulator::SimulatedBus bus_{Platform::ClockScheduler()};
    const std::unique_ptr<Platform::DeviceFileSystem> files_ = Platform::Drivers::MakeDriverFileSystem(bus_);
    const Platform::ScopedDeviceFiles inForce_{*files_};
};

}  // namespace Varnholt::Tests
