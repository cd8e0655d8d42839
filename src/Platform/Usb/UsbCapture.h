#pragma once

#include <memory>
#include <string>
#include <vector>

#include "Platform/Usb/PcapngWriter.h"
#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Usb {

/// The same device with every transfer recorded: its submission, and its completion with the command it
/// carries as a comment. `writer` must outlive the result.
std::shared_ptr<UsbDevice> CaptureDevice(std::shared_ptr<UsbDevice> device, PcapngWriter& writer,
                                         std::uint8_t deviceNumber);

/// A bus whose devices are all recorded. `bus` and `writer` must outlive it.
class CapturingBus final : public UsbBus {
  public:
    CapturingBus(UsbBus& recordedBus, PcapngWriter& recorder) : bus_(recordedBus), writer_(recorder) {}

    std::vector<std::string> List() override { return bus_.List(); }
    std::shared_ptr<UsbDevice> Open(const std::string& name, ErrorCode& error) override;

  private:
    UsbBus& bus_;
    PcapngWriter& writer_;
    std::vector<std::string> names_;  // an instrument keeps its device number when it is opened again
};

}  // namespace Varnholt::Platform::Usb
