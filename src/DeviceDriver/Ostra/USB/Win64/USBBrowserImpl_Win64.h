#pragma once

#include "DeviceDriver/Ostra/USB/USBBrowser.h"

namespace Varnholt::DeviceDriver::Ostra::USB {

/// The instruments that stand on the USBIO driver.
class USBBrowserImpl_Win64 final : public USBBrowser {
  public:
    std::list<std::string> GetDevices(const std::int32_t& selector) override;
    bool IsAnyOstraConnected() override;
};

}  // namespace Varnholt::DeviceDriver::Ostra::USB
