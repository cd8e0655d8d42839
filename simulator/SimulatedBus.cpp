#include "SimulatedBus.h"

#include <utility>

#include "FaultInjector.h"

namespace Varnholt::Simulator {

using Platform::Usb::UsbDevice;
namespace Errors = Platform::Errors;

std::vector<std::string> SimulatedBus::List() {
    const std::lock_guard lock(mutex_);
    std::vector<std::string> names;
    for (const auto& [name, instrument] : instruments_) {
        if (instrument->PluggedIn()) {
            names.push_back(name);
        }
    }
    return names;
}

std::shared_ptr<UsbDevice> SimulatedBus::Open(const std::string& name, Platform::ErrorCode& error) {
    std::shared_ptr<SimulatedInstrument> instrument;
    std::shared_ptr<FaultScript> script;
    Wrapper wrap;
    {
        const std::lock_guard lock(mutex_);
        if (const auto found = instruments_.find(name); found != instruments_.end()) {
            instrument = found->second;
        }
        if (const auto found = faults_.find(name); found != faults_.end()) {
            script = found->second;
        }
        wrap = wrapper_;
    }
    if (!instrument || !instrument->PluggedIn()) {
        error = Errors::FileNotFound;
        return nullptr;
    }
    error = Errors::Success;
    std::shared_ptr<UsbDevice> device = SimulatedInstrument::Connect(instrument);
    if (script) {
        device = InjectFaults(std::move(device), std::move(script), scheduler_,
                              [instrument] { instrument->Unplug(); });
    }
    return wrap ? wrap(name, std::move(device)) : device;
}

SimulatedInstrument& SimulatedBus::Add(const std::string& name, InstrumentSettings settings) {
    auto instrument = std::make_shared<SimulatedInstrument>(scheduler_, std::move(settings));
    const std::lock_guard lock(mutex_);
    return *(instruments_[name] = std::move(instrument));
}

SimulatedInstrument& SimulatedBus::Instrument(const std::string& name) {
    const std::lock_guard lock(mutex_);
    return *instruments_.at(name);
}

void SimulatedBus::Remove(const std::string& name) {
    Unplug(name);
    std::shared_ptr<SimulatedInstrument> removed;  // ends outside the lock: that waits for its events
    const std::lock_guard lock(mutex_);
    faults_.erase(name);
    removed = std::move(instruments_.at(name));
    instruments_.erase(name);
}

std::shared_ptr<FaultScript> SimulatedBus::SetFaults(const std::string& name, FaultPlan plan) {
    auto script = std::make_shared<FaultScript>(std::move(plan));
    const std::lock_guard lock(mutex_);
    if (script->Plan().Faults().empty()) {
        faults_.erase(name);
    } else {
        faults_[name] = script;
    }
    return script;
}

void SimulatedBus::WrapDevices(Wrapper devicesWrapper) {
    const std::lock_guard lock(mutex_);
    wrapper_ = std::move(devicesWrapper);
}

}  // namespace Varnholt::Simulator
