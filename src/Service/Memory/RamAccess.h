#pragma once

#include <cstdint>
#include <optional>

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoRAM.h"

namespace Varnholt::Service {

/// The instrument's RAM parameters through the memory model, with what a single run of the tool has to add:
/// the model converts times with the time base of its own last store, which a new process does not have, so
/// the instrument's current mode is asked for it.
class RamAccess final {
  public:
    using Properties = DeviceDriver::Generic::Configuration::Properties;
    using Commands = Utilities::Tools::SmartPointer<DeviceDriver::Ostra::LowLevel::PellandoFunctionality>;

    explicit RamAccess(const Commands& usedCommands) : commands_(usedCommands) {}

    /// All identifiers of the model's set.
    Properties Load();
    /// Stores the measurement parameters of a set that `Load` made. An integration time that no mode of the
    /// instrument can count is a `Failure` that lists the modes, and a second time that the mode cannot
    /// count another; the instrument is then back in its mode, with its parameters as they were.
    ///
    /// A time that means a whole number of microseconds is taken as that number, which the model's own
    /// arithmetic does not do. An integration time that is still as it was loaded keeps mode and count, if
    /// the model can choose that mode for any time that is rounded to that count.
    void Store(const Properties& set);
    /// Stores it and loads what the instrument made of it: times are rounded to what its mode can count.
    Properties StoreAndLoad(const Properties& set);
    /// Seconds that the first measurement parameter counts.
    double TimeUnit();

  private:
    /// What the last `Load` found.
    struct LoadedTime {
        float seconds;
        std::uint16_t count;
        std::uint8_t mode;
    };

    /// Lets the model choose the mode for the set's time, which is changed where it must be.
    void SwitchMode(DeviceDriver::Ostra::LowLevel::PellandoRAM& ram, Properties& set,
                    std::uint8_t currentMode);

    const Commands commands_;
    std::optional<LoadedTime> loaded_;
};

}  // namespace Varnholt::Service
