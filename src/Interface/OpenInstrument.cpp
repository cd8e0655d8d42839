#include "Interface/OpenInstrument.h"

#include <cstdint>

#include "DeviceDriver/Ostra/USB/USBBrowser.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::Interface {

using DeviceDriver::Ostra::LowLevel::PellandoFunctionality;
using DeviceDriver::Ostra::USB::USBBrowser;
using Utilities::Tools::SmartPointer;

SmartPointer<PellandoFunctionality> OpenInstrumentByName(const std::string& name) {
    std::uint32_t candidates = 0;
    for (const std::int32_t selector : {0, 1}) {
        candidates += static_cast<std::uint32_t>(USBBrowser::Instance()->GetDevices(selector).size());
    }
    for (std::uint32_t index = 0; index < candidates; ++index) {
        try {
            std::string identifier;
            const SmartPointer<PellandoFunctionality> instrument(new PellandoFunctionality(nullptr, index));
            instrument->GetDeviceIdentifier(identifier);
            if (name.empty() || identifier == name) {
                return instrument;
            }
        } catch (...) {  // an instrument that does not open is not the one that is looked for
        }
    }
    throw Utilities::Exceptions::RuntimeException("", "");
}

}  // namespace Varnholt::Interface
