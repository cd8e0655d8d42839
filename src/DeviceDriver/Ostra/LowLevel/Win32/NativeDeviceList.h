#pragma once

#include <cstdint>
#include <string>

#include "Platform/DeviceInterfaces.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// A snapshot of the instruments that stand on their own kernel driver. Each question asks the platform a
/// bounded number of times, whatever it answers.
class NativeDeviceList final {
  public:
    NativeDeviceList();
    ~NativeDeviceList();
    NativeDeviceList(const NativeDeviceList&) = delete;
    NativeDeviceList& operator=(const NativeDeviceList&) = delete;

    /// As the platform gives it; empty when there is none at this index or it cannot be read.
    std::string PathAt(std::uint32_t index) const;

  private:
    std::string ReadPath(const Platform::InterfaceRecord& record) const;

    const Platform::DeviceList list_;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
