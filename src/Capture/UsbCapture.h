#pragma once

#include <memory>
#include <string>
#include <vector>

#include "Capture/PcapngWriter.h"
#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Capture {

namespace Usb = Platform::Usb;

/// The same device with every transfer recorded: its submission, and its completion with the command it
/// carries as a comment. `writer` must outlive the result.
std::shared_ptr<Usb::UsbDevice> CaptureDevice(std::shared_ptr<Usb::UsbDevice> device, PcapngWriter& writer,
                                              std::uint8_t deviceNumber);

/// A bus whose devices are recorded, once there is something to record into. `recordedBus` must outlive it.
class CapturingBus final : public Usb::UsbBus {
  public:
    explicit CapturingBus(Usb::UsbBus& recordedBus) : bus_(recordedBus) {}

    /// For what is opened from now on. `recorder` must outlive the bus and its devices.
    void RecordInto(PcapngWriter& recorder) { writer_ = &recorder; }

    std::vector<std::string> List() override { return bus_.List(); }
    std::shared_ptr<Usb::UsbDevice> Open(const std::string& name, Platform::ErrorCode& error) override;

  private:
    Usb::UsbBus& bus_;
    PcapngWriter* writer_ = nullptr;
    std::vector<std::string> names_;  // an instrument keeps its device number when it is opened again
};

}  // namespace Varnholt::Capture
