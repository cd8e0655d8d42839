#pragma once

#include <pybind11/pybind11.h>

#include <memory>
#include <string>

#include "Host.h"

namespace Varnholt::Python {

/// A simulated instrument inside this process, plugged in until it is closed.
class Simulation final {
  public:
    Simulation(const std::string& name, Simulator::InstrumentSettings settings, const std::string& faults,
               bool withVirtualTime);
    ~Simulation() { Close(); }
    Simulation(const Simulation&) = delete;
    Simulation& operator=(const Simulation&) = delete;

    const std::string& BusName() const { return name_; }
    void Close();

    void PressButton();
    void Unplug();
    void PlugIn();
    bool IsPluggedIn();
    pybind11::bytes Eeprom();
    void SetEeprom(const pybind11::bytes& content);
    /// Takes effect when the instrument is opened the next time.
    void SetFaults(const std::string& faults);
    /// Transfers that suffered one.
    std::uint32_t FaultsHit() const { return script_ ? script_->Hits() : 0; }

  private:
    Simulator::SimulatedInstrument& Get();

    const std::string name_;
    std::shared_ptr<Simulator::FaultScript> script_;
    bool isClosed_ = false;
};

void AddSimulation(pybind11::module_& module);

}  // namespace Varnholt::Python
