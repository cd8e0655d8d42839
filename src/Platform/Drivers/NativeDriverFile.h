#pragma once

#include <cstdint>
#include <memory>
#include <span>

#include "Platform/Drivers/DriverFile.h"

namespace Varnholt::Platform::Drivers {

/// A file of the instrument's own driver: the device itself (pipe 0), which takes device controls, or one of
/// the pipes below it. Every file has a share in the claim to the device.
///
/// Requests of a kind that the file does not take end with `Errors::InvalidFunction`. The driver clears the
/// halt of an endpoint before the next transfer on it, or with the last file.
class NativeDriverFile final : public DriverFile {
  public:
    /// Claims the device. Null on failure with the code in `error`; `Errors::FileNotFound` where the device
    /// has no such endpoint.
    static std::unique_ptr<NativeDriverFile> Open(std::shared_ptr<SharedDevice> shared,
                                                  std::uint32_t pipeNumber, ErrorCode& error);
    ~NativeDriverFile() override;

    Decision Move(bool in, Usb::Transfer& transfer) override;
    /// - `ControlVendorRequest`: the control block's request with `output` as its data stage.
    /// - `ControlAbortPipe`: ends the transfers of the endpoint that the block's value names.
    /// - `ControlButtonReport`: the block's request without a data stage, because what callers hand over as
    ///   data has no defined content.
    Decision Control(std::uint32_t code, std::span<const std::uint8_t> input, std::span<std::uint8_t> output,
                     Usb::Transfer& transfer) override;

    ErrorCode OutcomeOf(Usb::TransferStatus status) const override;
    ErrorCode RefusalOf(ErrorCode usbCode) const override { return usbCode; }

  private:
    NativeDriverFile(std::shared_ptr<SharedDevice> shared, std::uint8_t pipeEndpoint)
        : DriverFile(std::move(shared)), endpoint_(pipeEndpoint) {}
    Decision AbortPipe(std::uint16_t endpoint) const;

    const std::uint8_t endpoint_;  ///< 0: the device itself
    bool isClaimed_ = false;       ///< set by `Open`
};

}  // namespace Varnholt::Platform::Drivers
