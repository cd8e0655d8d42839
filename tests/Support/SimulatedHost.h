#pragma once

#include <memory>
#include <string>

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
    explicit SimulatedHost(Transport transport) : path(std::string(Name(transport)) + "/") {
        Platform::Override64BitHost(transport == Transport::UsbIo);
    }
    ~SimulatedHost() { Platform::Override64BitHost(std::nullopt); }
    SimulatedHost(const SimulatedHost&) = delete;
    SimulatedHost& operator=(const SimulatedHost&) = delete;

    Simulator::SimulatedBus& Bus() { return bus; }
    Simulator::SimulatedInstrument& Add(const std::string& name,
                                        Simulator::InstrumentSettings settings = {}) {
        return bus.Add(name, std::move(settings));
    }
    /// The identifier under which the library lists the instrument.
    std::string Identifier(const std::string& name) const { return path + name; }

  private:
    const std::string path;
    Simulator::SimulatedBus bus{Platform::ClockScheduler()};
    const std::unique_ptr<Platform::DeviceFileSystem> files = Platform::Drivers::MakeDriverFileSystem(bus);
    const Platform::ScopedDeviceFiles inForce{*files};
};

}  // namespace Varnholt::Tests
