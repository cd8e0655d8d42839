#pragma once

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "FaultPlan.h"
#include "Platform/EventScheduler.h"
#include "Platform/Usb/UsbDevice.h"
#include "SimulatedInstrument.h"

namespace Varnholt::Simulator {

/// A bus of simulated instruments in this process. Any thread.
class SimulatedBus final : public Platform::Usb::UsbBus {
  public:
    /// `eventScheduler` must outlive the bus and everything opened from it.
    explicit SimulatedBus(Platform::EventScheduler& eventScheduler) : scheduler_(eventScheduler) {}

    /// The instruments that are plugged in, ordered by name.
    std::vector<std::string> List() override;
    std::shared_ptr<Platform::Usb::UsbDevice> Open(const std::string& name,
                                                   Platform::ErrorCode& error) override;

    /// Puts a new instrument under `name`, plugged in.
    SimulatedInstrument& Add(const std::string& name, InstrumentSettings settings = {});
    /// The instrument of that name, plugged in or not; it must have been added.
    SimulatedInstrument& Instrument(const std::string& name);

    /// Takes it off the bus for good; what was opened before stays without a device.
    void Remove(const std::string& name);

    /// What was opened before stays without a device, also after the instrument is back.
    void Unplug(const std::string& name) { Instrument(name).Unplug(); }
    void PlugIn(const std::string& name) { Instrument(name).PlugIn(); }

    /// Every device opened from now on under this name suffers the faults of the plan, which counts transfers
    /// across openings. A fault that takes the device away unplugs the instrument. An empty plan ends them.
    std::shared_ptr<FaultScript> SetFaults(const std::string& name, FaultPlan plan);

    /// Puts something in front of every device that is opened from now on, in front of its faults: a
    /// recorder, a capture. Null takes it away again.
    using Wrapper = std::function<std::shared_ptr<Platform::Usb::UsbDevice>(
        const std::string& name, std::shared_ptr<Platform::Usb::UsbDevice> device)>;
    void WrapDevices(Wrapper devicesWrapper);

  private:
    struct Place {
        std::shared_ptr<SimulatedInstrument> instrument;
        std::shared_ptr<FaultScript> faults;  // null: none
    };

    Platform::EventScheduler& scheduler_;
    std::mutex mutex_;  // guards what follows
    std::map<std::string, Place> places_;
    Wrapper wrapper_;
};

}  // namespace Varnholt::Simulator
