#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionalityByte.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoFunctionality_PC.h"
#include "DeviceDriver/Ostra/LowLevel/Win64/PellandoFunctionality_Win64.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Tools/Win32/SystemHelperWin.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Varnholt::Utilities::Tools::SmartPointer;

SmartPointer<PellandoFunctionalityByte> PellandoFunctionalityByte::Instance(Generic::EventListener* listener,
                                                                            std::uint32_t deviceIndex) try {
    if (Varnholt::Utilities::Tools::Is64BitOS()) {
        return SmartPointer<PellandoFunctionalityByte>(
            new PellandoFunctionality_Win64(listener, deviceIndex));
    }
    return SmartPointer<PellandoFunctionalityByte>(new PellandoFunctionality_PC(listener, deviceIndex));
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
