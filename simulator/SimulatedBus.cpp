#include "SimulatedBus.h"

#include <utility>

#include "FaultInjector.h"

namespace Varnholt::Simulator {

using Platform::Usb::UsbDevice;
namespace Errors = Platform::Errors;

std::vector<std::string> SimulatedBus::List() {
    const std::lock_guard lock(mutex);
    std::vector<std::string> names;
    for (const auto& [name, instrument] : instruments) {
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
        const std::lock_guard lock(mutex);
        if (const auto found = instruments.find(name); found != instruments.end()) {
            instrument = found->second;
        }
        if (const auto found = faults.find(name); found != faults.end()) {
            script = found->second;
        }
        wrap = wrapper;
    }
    if (!instrument || !instrument->PluggedIn()) {
        error = Errors::FileNotFound;
        return nullptr;
    }
    error = Errors::Success;
    std::shared_ptr<UsbDevice> device = SimulatedInstrument::Connect(instrument);
    if (script) {
        device = InjectFaults(std::move(device), std::move(script), scheduler,
                              [instrument] { instrument->Unplug(); });
    }
    return wrap ? wrap(name, std::move(device)) : device;
}

SimulatedInstrument& SimulatedBus::Add(const std::string& name, InstrumentSettings settings) {
    auto instrument = std::make_shared<SimulatedInstrument>(scheduler, std::move(settings));
    const std::lock_guard lock(mutex);
    return *(instruments[name] = std::move(instrument));
}

SimulatedInstrument& SimulatedBus::Instrument(const std::string& name) {
    const std::lock_guard lock(mutex);
    return *instruments.at(name);
}

std::shared_ptr<FaultScript> SimulatedBus::SetFaults(const std::string& name, FaultPlan plan) {
    auto script = std::make_shared<FaultScript>(std::move(plan));
    const std::lock_guard lock(mutex);
    if (script->Plan().Faults().empty()) {
        faults.erase(name);
    } else {
        faults[name] = script;
    }
    return script;
}

void SimulatedBus::WrapDevices(Wrapper devicesWrapper) {
    const std::lock_guard lock(mutex);
    wrapper = std::move(devicesWrapper);
}

}  // namespace Varnholt::Simulator
