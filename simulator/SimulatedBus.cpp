#include "SimulatedBus.h"

#include <utility>

#include "FaultInjector.h"

namespace Varnholt::Simulator {

using Platform::Usb::UsbDevice;
namespace Errors = Platform::Errors;

std::vector<std::string> SimulatedBus::List() {
    const std::lock_guard lock(mutex_);
    std::vector<std::string> names;
    for (const auto& [name, place] : places_) {
        if (place.instrument->PluggedIn()) {
            names.push_back(name);
        }
    }
    return names;
}

std::shared_ptr<UsbDevice> SimulatedBus::Open(const std::string& name, Platform::ErrorCode& error) {
    Place place;
    Wrapper wrap;
    {
        const std::lock_guard lock(mutex_);
        if (const auto found = places_.find(name); found != places_.end()) {
            place = found->second;
        }
        wrap = wrapper_;
    }
    const std::shared_ptr<SimulatedInstrument> instrument = place.instrument;
    if (!instrument || !instrument->PluggedIn()) {
        error = Errors::FileNotFound;
        return nullptr;
    }
    error = Errors::Success;
    std::shared_ptr<UsbDevice> device = SimulatedInstrument::Connect(instrument);
    if (place.faults) {
        device = InjectFaults(std::move(device), std::move(place.faults), scheduler_,
                              [instrument] { instrument->Unplug(); });
    }
    return wrap ? wrap(name, std::move(device)) : device;
}

SimulatedInstrument& SimulatedBus::Add(const std::string& name, InstrumentSettings settings) {
    auto instrument = std::make_shared<SimulatedInstrument>(scheduler_, std::move(settings));
    const std::lock_guard lock(mutex_);
    return *(places_[name].instrument = std::move(instrument));
}

SimulatedInstrument& SimulatedBus::Instrument(const std::string& name) {
    const std::lock_guard lock(mutex_);
    return *places_.at(name).instrument;
}

void SimulatedBus::Remove(const std::string& name) {
    Unplug(name);
    Place removed;  // ends outside the lock: that waits for its events
    const std::lock_guard lock(mutex_);
    removed = places_.at(name);
    places_.erase(name);
}

std::shared_ptr<FaultScript> SimulatedBus::SetFaults(const std::string& name, FaultPlan plan) {
    auto script = std::make_shared<FaultScript>(std::move(plan));
    const std::lock_guard lock(mutex_);
    places_.at(name).faults = script->Plan().Faults().empty() ? nullptr : script;
    return script;
}

void SimulatedBus::WrapDevices(Wrapper devicesWrapper) {
    const std::lock_guard lock(mutex_);
    wrapper_ = std::move(devicesWrapper);
}

}  // namespace Varnholt::Simulator
