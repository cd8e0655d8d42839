// What makes the library one of simulated instruments: its own device files in the place of the system's, and
// what surrounds each call of a host. Linked before the library's archives, whose objects for the same
// functions are then left out.
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "EepromImageFile.h"
#include "Interface/HostCall.h"
#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/Usb/SimulatorBus.h"
#include "SchedulerInForce.h"
#include "SimulatedBus.h"
#include "SimulatedSetup.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Files/AtomicFile.h"
#ifndef _WIN32
#include "VirtualClock.h"
#endif

namespace Varnholt::Simulator {
namespace {

constexpr const char* Variable = "OSTRA_SIMULATED";

SimulatedSetup ReadSetup() {
    const char* const value = std::getenv(Variable);
    std::string text = value ? value : "";
    if (text.starts_with('@')) {
        const std::string name = text.substr(1);
        std::ifstream file(name);
        text.assign(std::istreambuf_iterator<char>(file), {});
        if (!file.is_open() || file.bad()) {
            throw std::runtime_error(name + " cannot be read");
        }
    }
    SimulatedSetup setup = SimulatedSetup::Parse(text);
#ifdef _WIN32
    if (setup.isTimeVirtual) {
        throw std::runtime_error("time=virtual: time is real on Windows");
    }
#endif
    return setup;
}

/// The instruments, from the first call to the end of the process.
class SimulatedLibrary final {
  public:
    static SimulatedLibrary& Instance() {
        static const auto library = std::make_unique<SimulatedLibrary>(ReadSetup());
        return *library;
    }

    explicit SimulatedLibrary(SimulatedSetup simulatedSetup) : setup_(std::move(simulatedSetup)) {
        for (SimulatedSetup::Instrument& instrument : setup_.instruments) {
            InstrumentSettings settings = instrument.settings;
            if (!instrument.eepromFile.empty() && std::ifstream(instrument.eepromFile).is_open()) {
                settings.eeprom = ReadEepromFile(instrument.eepromFile);
            }
            instrument.name = Platform::Usb::SimulatedPrefix + instrument.name;
            kept_.push_back(bus_.Add(instrument.name, std::move(settings)).Eeprom());
            bus_.SetFaults(instrument.name, instrument.faults);
        }
    }

    Platform::DeviceFileSystem& Files() { return *files_; }

    void BeginCall() {
#ifndef _WIN32
        if (setup_.isTimeVirtual) {
            clock_.emplace(setup_.instruments.front().settings.seed);
            clock_->HandleDeadlock([](const std::string& report) { std::cerr << report; });
        }
#endif
    }
    void EndCall() {
#ifndef _WIN32
        if (clock_) {
            // Off and on again: nothing is left that waits for an event of this clock.
            for (const std::string& name : bus_.List()) {
                bus_.Unplug(name);
                bus_.PlugIn(name);
            }
            clock_.reset();
        }
#endif
        SaveMemories();
    }

  private:
    void SaveMemories() {
        for (std::size_t i = 0; i < kept_.size(); ++i) {
            const std::string& file = setup_.instruments[i].eepromFile;
            std::vector<std::uint8_t> memory = bus_.Instrument(setup_.instruments[i].name).Eeprom();
            if (!file.empty() && memory != kept_[i]) {
                Utilities::Files::WriteFileAtomically(file, memory);
                kept_[i] = std::move(memory);
            }
        }
    }

    SimulatedSetup setup_;
    SchedulerInForce scheduler_;
    SimulatedBus bus_{scheduler_};
    const std::unique_ptr<Platform::DeviceFileSystem> files_ = Platform::Drivers::MakeDriverFileSystem(bus_);
    std::vector<std::vector<std::uint8_t>> kept_;  ///< what the files hold, or would
#ifndef _WIN32
    std::optional<VirtualClock> clock_;
#endif
};

}  // namespace
}  // namespace Varnholt::Simulator

namespace Varnholt::Interface {

using Simulator::SimulatedLibrary;

HostCall::HostCall() {
    try {
        SimulatedLibrary::Instance().BeginCall();
    } catch (const std::exception& error) {
        throw Utilities::Exceptions::RuntimeException(std::string(Simulator::Variable) + ": " + error.what(),
                                                      Utilities::Exceptions::Here());
    }
}

HostCall::~HostCall() {
    try {
        SimulatedLibrary::Instance().EndCall();
    } catch (const std::exception& error) {
        std::cerr << "ostra: " << error.what() << std::endl;
    }
}

}  // namespace Varnholt::Interface

namespace Varnholt::Platform {

DeviceFileSystem& SystemDeviceFiles() {
    return Simulator::SimulatedLibrary::Instance().Files();
}

}  // namespace Varnholt::Platform
