#include "DeviceDriver/Ostra/USB/USBBrowser.h"

#include "DeviceDriver/Ostra/USB/Win32/USBBrowserImpl.h"
#include "DeviceDriver/Ostra/USB/Win64/USBBrowserImpl_Win64.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::USB {

using Varnholt::Utilities::Tools::SmartPointer;

namespace {

SmartPointer<USBBrowser> Make(Transport transport) {
    if (transport == Transport::UsbIo) {
        return SmartPointer<USBBrowser>(new USBBrowserImpl_Win64);
    }
    return SmartPointer<USBBrowser>(new USBBrowserImpl_PC);
}

}  // namespace

SmartPointer<USBBrowser> USBBrowser::Instance() try { return Make(HostTransport()); }
TRACED

SmartPointer<USBBrowser> USBBrowser::Instance(Transport transport) try { return Make(transport); }
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::USB
