#pragma once

#include "UsbIo/CUsbIo.h"

namespace Varnholt::UsbIo {

/// A device list for the life of a block, however the block is left.
class ScopedDeviceList final {
  public:
    explicit ScopedDeviceList(const Protocol::Guid& interfaceGuid)
        : list(CUsbIo::CreateDeviceList(&interfaceGuid)) {}
    ~ScopedDeviceList() {
        if (list) {
            CUsbIo::DestroyDeviceList(list);
        }
    }
    ScopedDeviceList(const ScopedDeviceList&) = delete;
    ScopedDeviceList& operator=(const ScopedDeviceList&) = delete;

    /// Null when the platform could not make the list.
    Platform::DeviceList Get() const { return list; }

  private:
    const Platform::DeviceList list;
};

}  // namespace Varnholt::UsbIo
