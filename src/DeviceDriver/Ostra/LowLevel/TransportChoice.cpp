#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionalityByte.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoFunctionality_PC.h"
#include "DeviceDriver/Ostra/LowLevel/Win64/PellandoFunctionality_Win64.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Varnholt::Utilities::Tools::SmartPointer;

namespace {

SmartPointer<PellandoFunctionalityByte> Open(Generic::EventListener* listener, std::uint32_t deviceIndex,
                                             Transport transport) {
    if (transport == Transport::UsbIo) {
        return SmartPointer<PellandoFunctionalityByte>(
            new PellandoFunctionality_Win64(listener, deviceIndex));
    }
    return SmartPointer<PellandoFunctionalityByte>(new PellandoFunctionality_PC(listener, deviceIndex));
}

}  // namespace

SmartPointer<PellandoFunctionalityByte> PellandoFunctionalityByte::Instance(Generic::EventListener* listener,
                                                                            std::uint32_t deviceIndex) try {
    return Open(listener, deviceIndex, HostTransport());
}
TRACED

SmartPointer<PellandoFunctionalityByte> PellandoFunctionalityByte::Instance(Generic::EventListener* listener,
                                                                            std::uint32_t deviceIndex,
                                                                            Transport transport) try {
    return Open(listener, deviceIndex, transport);
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
