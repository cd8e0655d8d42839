#include "DeviceDriver/Ostra/USB/USBBrowser.h"

#include "DeviceDriver/Ostra/USB/Win32/USBBrowserImpl.h"
#include "DeviceDriver/Ostra/USB/Win64/USBBrowserImpl_Win64.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Tools/Win32/SystemHelperWin.h"

namespace Varnholt::DeviceDriver::Ostra::USB {

using Varnholt::Utilities::Tools::SmartPointer;

SmartPointer<USBBrowser> USBBrowser::Instance() try {
    if (Varnholt::Utilities::Tools::Is64BitOS()) {
        return SmartPointer<USBBrowser>(new USBBrowserImpl_Win64);
    }
    return SmartPointer<USBBrowser>(new USBBrowserImpl_PC);
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::USB
