#pragma once

#include <cstddef>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Simulator {

/// One transfer as the host sees it.
struct RecordedTransfer {
    std::uint8_t endpoint = 0;
    Platform::Usb::SetupPacket setup;  ///< control transfers only
    std::uint32_t length = 0;          ///< asked for
    bool completed = false;            ///< false: still under way
    bool accepted = true;              ///< false: the device refused to start it
    Platform::Usb::TransferStatus status = Platform::Usb::TransferStatus::Completed;
    std::vector<std::uint8_t> data;  ///< out: what was to be sent; in: what came

    /// "control C1 out 8: 01 26 00 00 00 01 06 00", "bulk-in 256: ..." or "bulk-in 256: stalled"; long data
    /// are cut after `most` bytes.
    std::string Text(std::size_t most = 16) const;
};

/// Writes down the transfers of any number of devices, in order of submission. Any thread.
class TransferRecorder final {
  public:
    /// The same device, recorded. The recorder must outlive the result.
    std::shared_ptr<Platform::Usb::UsbDevice> Record(std::shared_ptr<Platform::Usb::UsbDevice> device);

    std::vector<RecordedTransfer> Transfers() const;
    /// A text with a line for each, `RecordedTransfer::Text`; those of the interrupt endpoint are left out:
    /// when they happen is the business of a thread of the host.
    std::string Text(std::size_t most) const;
    /// The number of transfers so far; a fault plan's index counts the same way.
    std::size_t Count() const;
    void Clear();

  private:
    struct Running;
    class Device;

    mutable std::mutex mutex_;  // guards what follows, and what the records say
    std::vector<std::shared_ptr<RecordedTransfer>> transfers_;
};

std::string ToText(Platform::Usb::TransferStatus status);

}  // namespace Varnholt::Simulator
