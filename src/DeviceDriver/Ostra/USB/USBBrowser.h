#pragma once

#include <cstdint>
#include <list>
#include <string>

#include "DeviceDriver/Ostra/Transport.h"
#include "Utilities/Tools/SmartPointer.h"

namespace Varnholt::DeviceDriver::Ostra::USB {

/// Lists the instruments that are connected. Each call enumerates afresh, so a list is a snapshot; the
/// position of a path in it is the device index by which the instrument is opened. Any thread.
class USBBrowser {
  public:
    virtual ~USBBrowser() = default;

    /// The paths of at most 127 instruments in the platform's order. No implementation reads `selector`. A
    /// platform failure gives a shorter or empty list.
    virtual std::list<std::string> GetDevices(const std::int32_t& selector) = 0;
    virtual bool IsAnyOstraConnected() = 0;

    /// A new browser for the transport of this host.
    static Varnholt::Utilities::Tools::SmartPointer<USBBrowser> Instance();
    static Varnholt::Utilities::Tools::SmartPointer<USBBrowser> Instance(Transport transport);
};

}  // namespace Varnholt::DeviceDriver::Ostra::USB
