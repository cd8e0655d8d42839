#include "Simulation.h"

#include "Instrument.h"
#include "Platform/Threads.h"
#include "Values.h"

namespace Varnholt::Python {

using Service::Failure;
using Service::FailureKind;

namespace {

Simulator::FaultPlan PlanOf(const std::string& faults) try {
    return Simulator::FaultPlan::Parse(faults);
} catch (const std::invalid_argument& error) {
    throw Failure(FailureKind::BadArgument, error.what());
}

std::shared_ptr<Simulation> MakeSimulation(const std::string& name, std::uint64_t seed, double light,
                                           double gain, bool hasOldFirmware, bool takesIntegrationTime,
                                           std::uint64_t scanBytes, std::uint64_t bytesPerSecond,
                                           const py::object& eeprom, const std::string& faults,
                                           bool withVirtualTime) {
    Simulator::InstrumentSettings settings;
    settings.seed = seed;
    settings.light = light;
    settings.gain = gain;
    settings.firmware = hasOldFirmware ? Simulator::OldFirmware : Simulator::NewFirmware;
    settings.takesIntegrationTime = takesIntegrationTime;
    settings.scanBytes = scanBytes;
    settings.bytesPerSecond = bytesPerSecond;
    if (!eeprom.is_none()) {
        settings.eeprom = ImageFrom(eeprom.cast<py::bytes>());
    }
    return Make<Simulation>(name, std::move(settings), faults, withVirtualTime);
}

}  // namespace

Simulation::Simulation(const std::string& name, Simulator::InstrumentSettings settings,
                       const std::string& faults, bool withVirtualTime)
    : name_([&] {
          PlanOf(faults);  // before anything is plugged in
          return Host::Instance().AddSimulated(name, std::move(settings), withVirtualTime);
      }()) {
    SetFaults(faults);
}

void Simulation::Close() {
    if (Host::Instance().IsForked()) {
        return;
    }
    Host::Instance().CheckUsable();
    if (!std::exchange(isClosed_, true)) {
        const AwayIfHere away;
        Host::Instance().RemoveSimulated(name_);
    }
}

Simulator::SimulatedInstrument& Simulation::Get() {
    Host::Instance().CheckUsable();
    if (isClosed_) {
        throw Failure(FailureKind::Other, "the simulation is closed");
    }
    return Host::Instance().Simulated().Instrument(name_);
}

void Simulation::PressButton() {
    Simulator::SimulatedInstrument& instrument = Get();
    const Away away;
    instrument.PressButton();
}

void Simulation::Unplug() {
    Simulator::SimulatedInstrument& instrument = Get();
    const Away away;
    instrument.Unplug();
}

void Simulation::PlugIn() {
    Get().PlugIn();
}

bool Simulation::IsPluggedIn() {
    return Get().PluggedIn();
}

py::bytes Simulation::Eeprom() {
    return BytesOf(Get().Eeprom());
}

void Simulation::SetEeprom(const py::bytes& content) {
    Get().SetEeprom(ImageFrom(content));
}

void Simulation::SetFaults(const std::string& faults) {
    Get();
    script_ = Host::Instance().Simulated().SetFaults(name_, PlanOf(faults));
}

void AddSimulation(py::module_& module) {
    py::class_<Simulation, std::shared_ptr<Simulation>>(module, "Simulation")
        .def(py::init(&MakeSimulation), py::arg("name"), py::arg("seed"), py::arg("light"), py::arg("gain"),
             py::arg("old_firmware"), py::arg("takes_integration_time"), py::arg("scan_bytes"),
             py::arg("bytes_per_second"), py::arg("eeprom"), py::arg("faults"), py::arg("virtual_time"))
        .def_property_readonly("bus_name", &Simulation::BusName)
        .def("close", &Simulation::Close)
        .def("press_button", &Simulation::PressButton)
        .def("unplug", &Simulation::Unplug)
        .def("plug_in", &Simulation::PlugIn)
        .def("is_plugged_in", &Simulation::IsPluggedIn)
        .def("eeprom", &Simulation::Eeprom)
        .def("set_eeprom", &Simulation::SetEeprom)
        .def("set_faults", &Simulation::SetFaults)
        .def("faults_hit", &Simulation::FaultsHit);
    module.def("virtual_seconds", [] { return Host::Instance().VirtualSeconds(); });
    module.def("sleep", [](double seconds) {
        Host::Instance().CheckUsable();
        const Away away;
        Platform::SleepMilliseconds(static_cast<std::uint32_t>(seconds * 1e3));
    });
}

}  // namespace Varnholt::Python
