#pragma once

#include "UsbIo/CUsbIo.h"
#include "UsbIo/CUsbIoBuffer.h"

namespace Varnholt::UsbIo {

/// A device handle that is bound to one endpoint. Each buffer carries its own transfer, so transfers of one
/// pipe may overlap; a buffer is started, waited for and cancelled by one thread.
class CUsbIoPipe : public CUsbIo {
  public:
    /// Opens the device as `Open` does unless the object is open, then binds the handle to the endpoint.
    std::uint32_t Bind(int deviceNumber, unsigned char endpointAddress, const Platform::DeviceList& list,
                       const Protocol::Guid* interfaceGuid);
    /// Ends the transfers of this pipe, whatever thread started them.
    std::uint32_t AbortPipe();

    /// Start a transfer of `NumberOfBytesToTransfer` bytes. True with `Status` 0 when it completed at once
    /// and with `Status` 997 when it runs; false with the platform's code in `Status` when it failed to
    /// start.
    bool Read(CUsbIoBuffer& buffer);
    bool Write(CUsbIoBuffer& buffer);

    /// Waits until the buffer's transfer has completed and returns its status. Before that: `TimedOut` after
    /// `timeout`, `UserEvent` when `event` (a waitable object, may be left out) is signalled first, and the
    /// wait's own result when the platform refuses it; the transfer then goes on. With `Infinite` a read is
    /// waited for until it is ended, on Linux a write until its driver does so, after 5 s and 10 ms a byte.
    std::uint32_t WaitForCompletion(CUsbIoBuffer& buffer, std::uint32_t timeout,
                                    Platform::Handle event = Platform::NoHandle);

    /// One transfer, waited for. `size` is the bytes asked for and becomes the bytes moved, with every
    /// status: a transfer that was cancelled after `timeout` (status `TimedOut`) can have moved data, even
    /// all of it. The device is done with `data` when the operation returns.
    std::uint32_t ReadSync(void* data, std::uint32_t& size, std::uint32_t timeout);
    std::uint32_t WriteSync(const void* data, std::uint32_t& size, std::uint32_t timeout);

    /// As `ReadSync`, and `event` ends the transfer as the time-out does, with status `UserEvent`.
    std::uint32_t ReadSyncUntil(void* data, std::uint32_t& size, std::uint32_t timeout,
                                Platform::Handle event);

    /// Cancels the buffer's transfer if it still runs, and returns when it has completed. Only by the thread
    /// that started it.
    void CancelToCompletion(CUsbIoBuffer& buffer);

  private:
    std::uint32_t Finish(CUsbIoBuffer& buffer, std::uint32_t& size, std::uint32_t timeout,
                         Platform::Handle event);
};

}  // namespace Varnholt::UsbIo
