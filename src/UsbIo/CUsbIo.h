#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "Platform/DeviceInterfaces.h"
#include "Platform/OverlappedRequest.h"
#include "Platform/WaitableObjects.h"
#include "Protocol/Guid.h"
#include "UsbIo/UsbIoRecords.h"

/// The programming interface of the USBIO driver: devices, pipes bound to endpoints, transfers.
///
/// Operations report a 32-bit status: 0 is success, codes from 0xE0000000 on are the driver's or this
/// library's (`Protocol::UsbIoDriver::Status`), others the platform's, passed through. Nothing is thrown,
/// whatever memory there is. Times are milliseconds, `Platform::Infinite` for no limit.
namespace Varnholt::UsbIo {

/// A device of the USBIO driver. Device controls may come from several threads and are carried out one at a
/// time; they wait without a limit of their own, because the driver completes each of them, also when the
/// device is gone, and on Linux after 5 s at the latest, with `TimedOut`.
/// `Open` and `Close` belong to the owner and must not meet a device control of another thread.
class CUsbIo {
  public:
    CUsbIo() = default;
    /// Closes.
    virtual ~CUsbIo();
    CUsbIo(const CUsbIo&) = delete;
    CUsbIo& operator=(const CUsbIo&) = delete;

    /// The present devices that expose the interface; null on failure.
    static Platform::DeviceList CreateDeviceList(const Protocol::Guid* interfaceGuid);
    /// Gives the list back, at the latest when it goes out of scope. Tells whether the platform's enumeration
    /// is to be had.
    static bool DestroyDeviceList(Platform::DeviceList& list);

    /// Opens device `deviceNumber` of the list (which may be destroyed afterwards), or the driver's device of
    /// that number without a list, and checks the driver's interface version. On failure the object is
    /// closed, unless it was open before: then `AlreadyOpen`, and the open device is left alone.
    std::uint32_t Open(int deviceNumber, const Platform::DeviceList& list,
                       const Protocol::Guid* interfaceGuid);
    /// Transfers still running on the device are ended first.
    void Close();
    bool IsOpen() const { return FileHandle != Platform::NoHandle; }

    /// The path of the open device where it was opened through a list, else null. Valid until `Close`.
    const char* GetDevicePathName() const;

    /// Sends a device control and waits for it. `*bytesReturned`, where given, becomes the bytes moved, also
    /// on failure. `DeviceNotOpen` on a closed object.
    std::uint32_t IoctlSync(std::uint32_t code, const void* input, std::uint32_t inputSize, void* output,
                            std::uint32_t outputSize, std::uint32_t* bytesReturned);

    /// Asks for the end of the transfers that the calling thread started on this object.
    bool CancelIo();

    std::uint32_t GetDriverInfo(DriverInfo& info);
    std::uint32_t UnconfigureDevice();
    /// `InvalidFunctionParameter` for more interfaces than the driver's record holds.
    std::uint32_t SetConfiguration(const Configuration& configuration);
    std::uint32_t GetDeviceParameters(DeviceParameters& parameters);
    std::uint32_t SetDeviceParameters(const DeviceParameters& parameters);
    /// `length` is the bytes asked for and becomes the bytes received or sent.
    std::uint32_t ClassOrVendorInRequest(void* buffer, std::uint32_t& length,
                                         const ClassOrVendorRequest& request);
    std::uint32_t ClassOrVendorOutRequest(const void* buffer, std::uint32_t& length,
                                          const ClassOrVendorRequest& request);

    /// Writes "Error code 0x...: " and the text of `status` into `buffer`, cut to `size` - 1 characters and a
    /// terminating zero. Nothing is written when `buffer` is null or `size` is 0. Returns `buffer`.
    static char* ErrorText(char* buffer, std::size_t size, std::uint32_t status);

  protected:
    /// Null while closed. Atomic, because a pipe whose reading thread does not end is closed under it.
    std::atomic<Platform::Handle> FileHandle = Platform::NoHandle;

  private:
    std::uint32_t ReadDetail(int deviceNumber, const Platform::DeviceList& list,
                             const Protocol::Guid* interfaceGuid);
    std::uint32_t OpenPath(const std::string& path);

    Platform::RecursiveMutex controlLock_;  ///< guards `controlRequest` during a device control
    Platform::OwnedHandle controlEvent_;
    std::optional<Platform::OverlappedRequest> controlRequest_;  ///< set while open
    std::optional<std::string> DetailData;  ///< path of the open device, where it was opened through a list
};

}  // namespace Varnholt::UsbIo
