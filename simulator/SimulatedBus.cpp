#include "SimulatedBus.h"

#include <utility>

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
    Wrapper wrap;
    {
        const std::lock_guard lock(mutex);
        if (const auto found = instruments.find(name); found != instruments.end()) {
            instrument = found->second;
        }
        wrap = wrapper;
    }
    if (!instrument || !instrument->PluggedIn()) {
        error = Errors::FileNotFound;
        return nullptr;
    }
    error = Errors::Success;
    std::shared_ptr<UsbDevice> device = SimulatedInstrument::Connect(std::move(instrument));
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

void SimulatedBus::WrapDevices(Wrapper devicesWrapper) {
    const std::lock_guard lock(mutex);
    wrapper = std::move(devicesWrapper);
}

}  // namespace Varnholt::Simulator
