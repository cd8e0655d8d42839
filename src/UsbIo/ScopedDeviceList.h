#pragma once

#include "UsbIo/CUsbIo.h"

namespace Varnholt::UsbIo {

/// A device list for the life of a block, however the block is left.
class ScopedDeviceList final {
  public:
    explicit ScopedDeviceList(const Protocol::Guid& interfaceGuid)
        : list_(CUsbIo::CreateDeviceList(&interfaceGuid)) {}
    ~ScopedDeviceList() {
        if (list_) {
            CUsbIo::DestroyDeviceList(list_);
        }
    }
    ScopedDeviceList(const ScopedDeviceList&) = delete;
    ScopedDeviceList& operator=(const ScopedDeviceList&) = delete;

    /// Null when the platform could not make the list.
    Platform::DeviceList Get() const { return list_; }

  private:
    const Platform::DeviceList list_;
};

}  // namespace Varnholt::UsbIo
