#pragma once

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "Instrument.h"

namespace Varnholt::Cli {

/// The instrument's RAM parameters through the memory model, with what a single run of the tool has to add:
/// the model converts times with the time base of its own last store, which a new process does not have, so
/// the instrument's current mode is asked for it.
class RamAccess final {
  public:
    using Properties = DeviceDriver::Generic::Configuration::Properties;

    explicit RamAccess(Instrument& usedInstrument) : instrument(usedInstrument) {}

    /// All identifiers of the model's set.
    Properties Load();
    /// Stores the measurement parameters of a set that `Load` made. An integration time that no mode of the
    /// instrument can count is a `ToolFailure` that lists the modes, and a second time that the mode cannot
    /// count another; the instrument is then back in its mode, with its parameters as they were.
    void Store(Properties& set);
    /// Seconds that the first measurement parameter counts.
    double TimeUnit();

  private:
    std::string DescribeModes();

    Instrument& instrument;
};

}  // namespace Varnholt::Cli
