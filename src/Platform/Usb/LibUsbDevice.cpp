#include "Platform/Usb/LibUsbDevice.h"

#include <fcntl.h>
#include <libusb-1.0/libusb.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <new>
#include <thread>
#include <utility>
#include <vector>

#include "Platform/Linux/ErrnoCodes.h"
#include "Platform/Linux/FileDescriptor.h"
#include "Platform/Linux/HostSignalsBlocked.h"
#include "Platform/LookUp.h"
#include "Platform/Usb/LibUsbEvents.h"
#include "Platform/Usb/ReleasedBy.h"
#include "Platform/Usb/UsbDescriptors.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Platform::Usb {
namespace {

constexpr int InterfaceNumber = 0;
constexpr int ConfigurationValue = 1;
/// A device that has just been plugged in can be opened before the kernel has configured it.
constexpr auto ClaimPatience = std::chrono::milliseconds(2000);
constexpr auto ClaimRetryPause = std::chrono::milliseconds(20);

/// All others are `Errors::GeneralFailure`: LIBUSB_ERROR_IO, _PIPE, _OVERFLOW, _OTHER.
constexpr std::pair<int, ErrorCode> Codes[] = {
    {LIBUSB_SUCCESS, Errors::Success},
    {LIBUSB_ERROR_ACCESS, Errors::AccessDenied},
    {LIBUSB_ERROR_NO_DEVICE, Errors::DeviceNotConnected},
    {LIBUSB_ERROR_NOT_FOUND, Errors::FileNotFound},
    {LIBUSB_ERROR_BUSY, Errors::Busy},
    {LIBUSB_ERROR_TIMEOUT, Errors::SemaphoreTimeout},
    {LIBUSB_ERROR_INVALID_PARAM, Errors::InvalidParameter},
    {LIBUSB_ERROR_NO_MEM, Errors::NotEnoughMemory},
    {LIBUSB_ERROR_NOT_SUPPORTED, Errors::NotSupported},
    {LIBUSB_ERROR_INTERRUPTED, Errors::OperationAborted},
};

/// All others are `TransferStatus::IoError`.
constexpr std::pair<int, TransferStatus> Statuses[] = {
    {LIBUSB_TRANSFER_COMPLETED, TransferStatus::Completed},
    {LIBUSB_TRANSFER_STALL, TransferStatus::Stalled},
    {LIBUSB_TRANSFER_OVERFLOW, TransferStatus::Overflow},
    {LIBUSB_TRANSFER_NO_DEVICE, TransferStatus::DeviceGone},
    {LIBUSB_TRANSFER_CANCELLED, TransferStatus::Cancelled},
    {LIBUSB_TRANSFER_TIMED_OUT, TransferStatus::Cancelled},
};

ErrorCode ErrorFromLibUsb(int libusbError) {
    return LookUp(Codes, libusbError, Errors::GeneralFailure);
}

TransferStatus StatusFromLibUsb(int libusbTransferStatus) {
    return LookUp(Statuses, libusbTransferStatus, TransferStatus::IoError);
}

/// What a transfer needs while it is under way: libusb's record, and for control transfers the buffer with
/// the setup bytes in front. Used again and again.
struct Submission {
    explicit Submission(class LibUsbDevice* submitter) : device(submitter) {}

    class LibUsbDevice* device;
    std::unique_ptr<libusb_transfer, ReleasedBy<libusb_free_transfer>> transfer{libusb_alloc_transfer(0)};
    Transfer* owner = nullptr;  ///< null: free for the next
    std::vector<std::uint8_t> controlBuffer;
};

/// The kernel keeps the descriptors at the beginning of the device's file.
std::vector<std::uint8_t> ReadDescriptors(int deviceFile) {
    std::vector<std::uint8_t> bytes(4096);
    const ssize_t count = pread(deviceFile, bytes.data(), bytes.size(), 0);
    bytes.resize(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
    return bytes;
}

using Context = std::unique_ptr<libusb_context, ReleasedBy<libusb_exit>>;
using DeviceHandle = std::unique_ptr<libusb_device_handle, ReleasedBy<libusb_close>>;

class LibUsbDevice final : public UsbDevice {
  public:
    LibUsbDevice(Linux::FileDescriptor deviceFile, Context ownContext, DeviceHandle openHandle)
        : file_(std::move(deviceFile)),
          context_(std::move(ownContext)),
          handle_(std::move(openHandle)),
          events_(std::make_shared<LibUsbEvents>(context_.get())) {}

    ~LibUsbDevice() override {
        {
            events_->HandleAlways();  // nobody needs to wait any more
            std::unique_lock lock(mutex_);
            for (const auto& submission : submissions_) {
                if (submission->owner) {
                    libusb_cancel_transfer(submission->transfer.get());
                }
            }
            idle_.wait(lock, [this] { return running_ == 0; });
        }
        Release();
        events_->Stop();
    }

    std::vector<EndpointInfo> Endpoints(ErrorCode& error) override {
        error = Errors::Success;
        return endpoints_;
    }
    ErrorCode Claim() override;
    void Release() override { libusb_release_interface(handle_.get(), InterfaceNumber); }
    ErrorCode Submit(Transfer& transfer) override;
    void Cancel(Transfer& transfer) override;
    ErrorCode ClearHalt(std::uint8_t endpoint) override {
        return ErrorFromLibUsb(libusb_clear_halt(handle_.get(), endpoint));
    }
    std::shared_ptr<CompletionSource> CompletionsOf(std::uint8_t endpoint) override {
        return endpoint != Protocol::InterruptInEndpoint ? events_
                                                         : nullptr;  // that one is waited for at leisure
    }

  private:
    static void LIBUSB_CALL Completed(libusb_transfer* transfer);
    void Complete(Submission& submission);
    Submission& FreeSubmission();
    void Fill(Submission& submission, const Transfer& transfer);

    // Closed in reverse order.
    const Linux::FileDescriptor file_;
    const Context context_;
    const DeviceHandle handle_;
    const std::shared_ptr<LibUsbEvents> events_;
    const std::vector<EndpointInfo> endpoints_ = EndpointsOfFirstInterface(ReadDescriptors(file_.Get()));

    std::mutex mutex_;  // guards what follows; never held while a client is called
    std::condition_variable idle_;
    std::vector<std::unique_ptr<Submission>> submissions_;
    int running_ = 0;  // transfers whose clients have not been told of their end yet
};

ErrorCode LibUsbDevice::Claim() {
    libusb_set_auto_detach_kernel_driver(handle_.get(), 1);
    const auto patienceEnds = std::chrono::steady_clock::now() + ClaimPatience;
    for (;;) {
        int configuration = 0;
        int result = libusb_get_configuration(handle_.get(), &configuration);
        if (result == LIBUSB_SUCCESS && configuration != ConfigurationValue) {
            result = libusb_set_configuration(handle_.get(), ConfigurationValue);
        }
        if (result == LIBUSB_SUCCESS) {
            result = libusb_claim_interface(handle_.get(), InterfaceNumber);
        }
        if (result != LIBUSB_ERROR_NOT_FOUND || std::chrono::steady_clock::now() >= patienceEnds) {
            return ErrorFromLibUsb(result);
        }
        std::this_thread::sleep_for(ClaimRetryPause);
    }
}

Submission& LibUsbDevice::FreeSubmission() {
    const auto isFree = [](const auto& submission) { return submission->owner == nullptr; };
    const auto found = std::ranges::find_if(submissions_, isFree);
    if (found != submissions_.end()) {
        return **found;
    }
    auto submission = std::make_unique<Submission>(this);
    if (!submission->transfer) {
        throw std::bad_alloc();
    }
    return *submissions_.emplace_back(std::move(submission));
}

void LibUsbDevice::Fill(Submission& submission, const Transfer& transfer) {
    libusb_transfer* const target = submission.transfer.get();
    if (transfer.endpoint == 0) {
        auto& buffer = submission.controlBuffer;
        buffer.resize(LIBUSB_CONTROL_SETUP_SIZE + transfer.length);
        libusb_fill_control_setup(buffer.data(), transfer.setup.requestType, transfer.setup.request,
                                  transfer.setup.value, transfer.setup.index, transfer.setup.length);
        if (!transfer.IsIn()) {
            std::copy_n(transfer.data, transfer.length, buffer.begin() + LIBUSB_CONTROL_SETUP_SIZE);
        }
        libusb_fill_control_transfer(target, handle_.get(), buffer.data(), &LibUsbDevice::Completed,
                                     &submission, 0);
    } else {
        libusb_fill_bulk_transfer(target, handle_.get(), transfer.endpoint, transfer.data,
                                  static_cast<int>(transfer.length), &LibUsbDevice::Completed, &submission,
                                  0);
        if (transfer.endpoint == Protocol::InterruptInEndpoint) {
            target->type = LIBUSB_TRANSFER_TYPE_INTERRUPT;
        }
    }
}

ErrorCode LibUsbDevice::Submit(Transfer& transfer) {
    const std::lock_guard lock(mutex_);
    Submission& submission = FreeSubmission();
    Fill(submission, transfer);
    submission.owner = &transfer;
    const int result = libusb_submit_transfer(submission.transfer.get());
    if (result == LIBUSB_SUCCESS) {
        transfer.deviceData = &submission;
        ++running_;
    } else {
        submission.owner = nullptr;
    }
    return ErrorFromLibUsb(result);
}

void LibUsbDevice::Cancel(Transfer& transfer) {
    const std::lock_guard lock(mutex_);
    if (auto* submission = static_cast<Submission*>(transfer.deviceData)) {
        libusb_cancel_transfer(submission->transfer.get());
        events_->HandleNow();
    }
}

void LibUsbDevice::Completed(libusb_transfer* transfer) {
    auto& submission = *static_cast<Submission*>(transfer->user_data);
    submission.device->Complete(submission);
}

void LibUsbDevice::Complete(Submission& submission) {
    Transfer& transfer = *submission.owner;
    const auto moved = static_cast<std::uint32_t>(submission.transfer->actual_length);
    transfer.actualLength = std::min(moved, transfer.length);
    transfer.status = StatusFromLibUsb(submission.transfer->status);
    if (transfer.endpoint == 0 && transfer.IsIn()) {
        std::copy_n(submission.controlBuffer.begin() + LIBUSB_CONTROL_SETUP_SIZE, transfer.actualLength,
                    transfer.data);
    }
    {
        const std::lock_guard lock(mutex_);
        transfer.deviceData = nullptr;
        submission.owner = nullptr;
    }
    transfer.client->TransferCompleted(transfer);
    const std::lock_guard lock(mutex_);
    --running_;
    idle_.notify_all();
}

}  // namespace

std::shared_ptr<UsbDevice> OpenLibUsbDevice(const std::string& deviceNode, ErrorCode& error) {
    Linux::FileDescriptor file(open(deviceNode.c_str(), O_RDWR | O_CLOEXEC));
    if (!file) {
        error = Linux::CodeOf(errno);
        if (error == Errors::DeviceNotConnected) {
            error = Errors::FileNotFound;  // what was never open cannot be lost
        }
        return nullptr;
    }
    libusb_context* context = nullptr;
    int result = LIBUSB_SUCCESS;
    {
        const Linux::HostSignalsBlocked blocked;  // libusb may start a thread
        result = libusb_init(&context);
    }
    Context ownContext(context);
    libusb_device_handle* handle = nullptr;
    if (result == LIBUSB_SUCCESS) {
        result = libusb_wrap_sys_device(context, file.Get(), &handle);
    }
    error = ErrorFromLibUsb(result);
    return result == LIBUSB_SUCCESS
               ? std::make_shared<LibUsbDevice>(std::move(file), std::move(ownContext), DeviceHandle(handle))
               : nullptr;
}

}  // namespace Varnholt::Platform::Usb
