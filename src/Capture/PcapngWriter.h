#pragma once

#include <cstdint>
#include <fstream>
#include <mutex>
#include <span>
#include <string>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Capture {

namespace Usb = Platform::Usb;

/// Writes USB traffic as a pcapng file with link type 220 (Linux usbmon with the 64-byte header), which
/// protocol analysers read. Formats: pcapng draft-ietf-opsawg-pcapng; link type 220 of the tcpdump link-layer
/// list. Any thread.
class PcapngWriter final {
  public:
    /// Begins `fileName` anew. `application` is noted in the file. Check `Failed` afterwards.
    PcapngWriter(const std::string& fileName, const std::string& application);

    struct Packet {
        std::uint64_t transferId;       ///< the same for a submission and its completion
        bool completion;                ///< false: submission
        std::uint8_t deviceNumber;      ///< 1 to 127
        const Usb::Transfer* transfer;  ///< status and actual length are looked at in completions only
        std::string comment;            ///< shown beside the packet; may be empty
    };
    void Write(const Packet& packet);

    /// True once something could not be written; the file then ends before that packet.
    bool Failed() const;

  private:
    void WriteBlock(std::uint32_t type, std::span<const std::uint8_t> body);

    mutable std::mutex mutex_;  // guards the file
    std::ofstream file_;
};

}  // namespace Varnholt::Capture
