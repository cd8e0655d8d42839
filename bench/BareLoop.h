#pragma once

#include <array>
#include <cstdint>
#include <vector>

#include "Platform/Handle.h"
#include "Platform/Usb/UsbDevice.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Bench {

inline constexpr std::uint32_t ChunkSize = 65536;

/// What a scan is compared with: the same two 64 KiB transfers in flight on the same device, each copied once
/// into one result buffer, without the library.
class BareLoop final : private Platform::Usb::TransferClient {
  public:
    explicit BareLoop(Platform::Usb::UsbDevice& usbDevice);
    ~BareLoop() override;

    /// Starts a measurement and reads until a transfer does not become full, or `total` bytes (0: no limit)
    /// came. `result` grows as needed.
    void Read(std::uint64_t total, std::vector<std::uint8_t>& result);

  private:
    struct Chunk : Platform::Usb::Transfer {
        std::vector<std::uint8_t> bytes = std::vector<std::uint8_t>(ChunkSize);
        const Platform::OwnedHandle completed{Platform::MakeAutoResetEvent()};
    };

    void TransferCompleted(Platform::Usb::Transfer& transfer) noexcept override;
    void Start(Chunk& chunk, std::uint32_t length);
    void Finish(Chunk& chunk);

    Platform::Usb::UsbDevice& device_;
    std::array<Chunk, 2> chunks_;
    Chunk control_;
};

}  // namespace Varnholt::Bench
