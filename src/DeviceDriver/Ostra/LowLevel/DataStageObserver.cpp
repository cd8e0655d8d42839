#include "DeviceDriver/Ostra/LowLevel/DataStageObserver.h"

#include <string>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

void WholeDataStages::DataStageEnded(std::uint32_t asked, std::uint32_t moved) {
    if (moved != asked) {
        throw IOException(std::to_string(moved) + " of " + std::to_string(asked) + " bytes came", Here(),
                          Shortfall{moved, asked});
    }
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
