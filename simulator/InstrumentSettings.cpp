#include "InstrumentSettings.h"

namespace Varnholt::Simulator {

InstrumentSettings SettingsOfNumber(std::size_t index) {
    InstrumentSettings settings;
    settings.serial = "SIM" + std::to_string(10001 + index).substr(1);
    settings.chipId.back() = static_cast<std::uint8_t>(settings.chipId.back() + index);
    settings.seed += index;
    return settings;
}

}  // namespace Varnholt::Simulator
