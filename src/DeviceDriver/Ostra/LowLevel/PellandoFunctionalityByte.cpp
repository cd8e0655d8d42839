#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionalityByte.h"

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

void PellandoFunctionalityByte::DataStageEnded(std::uint32_t asked, std::uint32_t moved) const {
    if (requiresWholeData_ && moved != asked) {
        throw IOException(std::to_string(moved) + " of " + std::to_string(asked) + " bytes came", Here(),
                          Shortfall{moved, asked});
    }
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
