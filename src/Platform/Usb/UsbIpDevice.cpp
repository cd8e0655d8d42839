#include "Platform/Usb/UsbIpDevice.h"

#include <algorithm>
#include <array>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <new>
#include <span>
#include <thread>
#include <utility>

#include "Platform/Linux/HostSignalsBlocked.h"
#include "Platform/LookUp.h"
#include "Platform/Usb/UsbDescriptors.h"
#include "Platform/Usb/UsbIpOperations.h"
#include "Platform/Usb/UsbIpSocket.h"

namespace Varnholt::Platform::Usb {
namespace {

using Clock = UsbIpSocket::Clock;

/// A peer that does not answer a cancellation by then is given up.
constexpr auto UnlinkPatience = std::chrono::milliseconds(1000);
/// A peer that does not close its end by then, after this one was closed, is left to itself.
constexpr auto ClosePatience = std::chrono::milliseconds(500);
/// For what the device itself is asked on behalf of the layers above.
constexpr auto RequestPatience = std::chrono::milliseconds(2000);

/// A transfer of the device's own, waited for.
class WaitedTransfer final : public Transfer, private TransferClient {
  public:
    WaitedTransfer(const SetupPacket& packet, std::span<std::uint8_t> buffer) {
        MakeControl(packet, buffer);
        client = this;
    }

    ErrorCode Do(UsbDevice& device) {
        if (const ErrorCode code = device.Submit(*this); code != Errors::Success) {
            return code;
        }
        std::unique_lock lock(mutex_);
        if (!completion_.wait_for(lock, RequestPatience, [this] { return completed_; })) {
            lock.unlock();
            device.Cancel(*this);
            lock.lock();
            completion_.wait(lock, [this] { return completed_; });
        }
        static constexpr std::pair<TransferStatus, ErrorCode> codes[] = {
            {TransferStatus::Completed, Errors::Success},
            {TransferStatus::DeviceGone, Errors::DeviceNotConnected},
            {TransferStatus::Cancelled, Errors::SemaphoreTimeout},
        };
        return LookUp(codes, status, Errors::GeneralFailure);
    }

  private:
    void TransferCompleted(Transfer&) noexcept override {
        const std::lock_guard lock(mutex_);
        completed_ = true;
        completion_.notify_all();
    }

    std::mutex mutex_;
    std::condition_variable completion_;
    bool completed_ = false;
};

class UsbIpDevice final : public UsbDevice {
  public:
    UsbIpDevice(UsbIpConnector connector, std::string id)
        : connect_(std::move(connector)), busId_(std::move(id)) {}
    ~UsbIpDevice() override { Release(); }

    std::vector<EndpointInfo> Endpoints(ErrorCode& error) override;
    ErrorCode Claim() override;
    void Release() override;
    ErrorCode Submit(Transfer& transfer) override;
    void Cancel(Transfer& transfer) override;
    ErrorCode ClearHalt(std::uint8_t endpoint) override;

  private:
    struct Running {
        Transfer* transfer;  // null: answered while its cancellation, which is answered yet, was on its way
        std::uint32_t sequence;
        std::uint32_t unlinkSequence = 0;
        Clock::time_point unlinkLimit{};
    };

    void Listen();
    bool HandleReply(const UsbIp::SubmitReply& reply);
    bool HandleReply(const UsbIp::UnlinkReply& reply);
    static void Complete(Transfer& transfer, TransferStatus status, std::uint32_t actualLength);

    // Called with `mutex` held.
    std::uint32_t NextSequence() { return ++lastSequence_ == 0 ? ++lastSequence_ : lastSequence_; }
    void LimitReceiving();

    const UsbIpConnector connect_;
    const std::string busId_;

    std::mutex claimMutex_;  // taken first; held while what follows changes
    std::unique_ptr<UsbIpSocket> socket_;
    std::uint32_t deviceId_ = 0;
    std::thread reader_;
    std::vector<EndpointInfo> endpoints_;

    std::mutex sendMutex_;  // taken second: packets leave in the order in which they are entered below
    std::mutex mutex_;      // taken last; guards what follows
    std::vector<Running> running_;
    std::uint32_t lastSequence_ = 0;
    bool connected_ = false;
    std::optional<Clock::time_point> releaseLimit_;  // set while the claim is being given back
};

ErrorCode UsbIpDevice::Claim() {
    const std::lock_guard claimLock(claimMutex_);
    if (socket_) {
        const std::lock_guard lock(mutex_);
        return connected_ ? Errors::Success : Errors::DeviceNotConnected;
    }
    ErrorCode error = Errors::DeviceNotConnected;
    const int file = connect_(error);
    if (file < 0) {
        return error;
    }
    auto newSocket = std::make_unique<UsbIpSocket>(file);
    if (error = ImportUsbIpDevice(*newSocket, busId_, deviceId_); error != Errors::Success) {
        return error;
    }
    socket_ = std::move(newSocket);
    const std::lock_guard lock(mutex_);  // what the reader finds comes after what is set here
    try {
        const Linux::HostSignalsBlocked blocked;
        reader_ = std::thread([this] { Listen(); });
    } catch (const std::exception&) {  // no thread, or no memory for it
        socket_.reset();
        return Errors::NoSystemResources;
    }
    connected_ = true;
    releaseLimit_.reset();
    return Errors::Success;
}

void UsbIpDevice::Release() {
    const std::lock_guard claimLock(claimMutex_);
    if (!socket_) {
        return;
    }
    {
        const std::lock_guard lock(mutex_);
        releaseLimit_ = Clock::now() + ClosePatience;
        LimitReceiving();
    }
    // Once the peer has closed its end, too, the device is free for the next who wants it.
    socket_->ShutdownSending();
    reader_.join();
    const std::lock_guard sendLock(sendMutex_);  // nobody is sending any more
    socket_.reset();
}

ErrorCode UsbIpDevice::Submit(Transfer& transfer) try {
    if (transfer.length > UsbIp::MaximumPayload) {
        return Errors::InvalidParameter;
    }
    UsbIp::SubmitPacket packet;
    packet.endpoint = transfer.endpoint;
    packet.in = transfer.IsIn();
    packet.length = transfer.length;
    packet.setup = transfer.endpoint == 0 ? transfer.setup : SetupPacket{};

    const std::lock_guard sendLock(sendMutex_);
    {
        const std::lock_guard lock(mutex_);
        if (!connected_ || releaseLimit_) {
            return Errors::DeviceNotConnected;
        }
        packet.sequence = NextSequence();
        running_.push_back({&transfer, packet.sequence});
    }
    packet.deviceId = deviceId_;
    const std::span<const std::uint8_t> payload(transfer.data, packet.in ? 0 : packet.length);
    if (!socket_->Send(UsbIp::Encode(packet), payload)) {
        socket_->Shutdown();  // the reader ends every transfer, this one too
    }
    return Errors::Success;
} catch (const std::bad_alloc&) {
    return Errors::NotEnoughMemory;
}

void UsbIpDevice::Cancel(Transfer& transfer) {
    const std::lock_guard sendLock(sendMutex_);
    UsbIp::UnlinkPacket packet;
    {
        const std::lock_guard lock(mutex_);
        const auto found = std::ranges::find(running_, &transfer, &Running::transfer);
        if (found == running_.end() || found->unlinkSequence != 0) {
            return;
        }
        packet.sequence = found->unlinkSequence = NextSequence();
        packet.victim = found->sequence;
        found->unlinkLimit = Clock::now() + UnlinkPatience;
        LimitReceiving();
    }
    packet.deviceId = deviceId_;
    if (!socket_->Send(UsbIp::Encode(packet), {})) {
        socket_->Shutdown();
    }
}

void UsbIpDevice::LimitReceiving() {
    std::optional<Clock::time_point> limit = releaseLimit_;
    for (const Running& each : running_) {
        if (each.transfer && each.unlinkSequence != 0 && (!limit || each.unlinkLimit < *limit)) {
            limit = each.unlinkLimit;
        }
    }
    socket_->ReceiveUntil(limit);
}

void UsbIpDevice::Listen() {
    const auto handle = [this](const auto& packet) {
        if constexpr (requires { HandleReply(packet); }) {
            return HandleReply(packet);
        }
        return false;
    };
    UsbIp::PacketBytes bytes{};
    while (socket_->Receive(bytes, false)) {
        const auto packet = UsbIp::DecodePacket(bytes);
        if (!packet || !std::visit(handle, *packet)) {
            break;
        }
    }
    socket_->Shutdown();
    std::vector<Running> left;
    TransferStatus status = TransferStatus::DeviceGone;
    {
        const std::lock_guard lock(mutex_);
        connected_ = false;
        left.swap(running_);
        status = releaseLimit_ ? TransferStatus::Cancelled : TransferStatus::DeviceGone;
    }
    for (const Running& each : left) {
        if (each.transfer) {
            Complete(*each.transfer, status, 0);
        }
    }
}

bool UsbIpDevice::HandleReply(const UsbIp::SubmitReply& reply) {
    Transfer* transfer = nullptr;
    {
        const std::lock_guard lock(mutex_);
        const auto found = std::ranges::find(running_, reply.sequence, &Running::sequence);
        if (found == running_.end() || !found->transfer) {
            return false;
        }
        transfer = found->transfer;
    }
    if (reply.actualLength > transfer->length ||
        (transfer->IsIn() && !socket_->Receive({transfer->data, reply.actualLength}, true))) {
        return false;
    }
    {
        const std::lock_guard lock(mutex_);
        const auto found = std::ranges::find(running_, reply.sequence, &Running::sequence);
        if (found->unlinkSequence == 0) {
            running_.erase(found);
        } else {
            found->transfer = nullptr;
        }
        LimitReceiving();
    }
    Complete(*transfer, UsbIp::TransferStatusOf(reply.status), reply.actualLength);
    return true;
}

bool UsbIpDevice::HandleReply(const UsbIp::UnlinkReply& reply) {
    Transfer* transfer = nullptr;
    {
        const std::lock_guard lock(mutex_);
        const auto found = std::ranges::find(running_, reply.sequence, &Running::unlinkSequence);
        if (found == running_.end() || reply.sequence == 0) {
            return false;
        }
        transfer = found->transfer;
        running_.erase(found);
        LimitReceiving();
    }
    if (transfer) {
        Complete(*transfer, TransferStatus::Cancelled, 0);
    }
    return true;
}

void UsbIpDevice::Complete(Transfer& transfer, TransferStatus status, std::uint32_t actualLength) {
    transfer.status = status;
    transfer.actualLength = actualLength;
    transfer.client->TransferCompleted(transfer);
}

std::vector<EndpointInfo> UsbIpDevice::Endpoints(ErrorCode& error) {
    const std::lock_guard claimLock(claimMutex_);
    error = Errors::Success;
    if (endpoints_.empty()) {
        constexpr SetupPacket getConfiguration{0x80, 6, 0x0200, 0};
        std::array<std::uint8_t, 255> bytes{};
        WaitedTransfer transfer(getConfiguration, bytes);
        error = transfer.Do(*this);
        if (error == Errors::Success) {
            endpoints_ = EndpointsOfFirstInterface(std::span(bytes).first(transfer.actualLength));
        }
    }
    return endpoints_;
}

ErrorCode UsbIpDevice::ClearHalt(std::uint8_t endpoint) {
    constexpr std::uint8_t toEndpoint = 0x02;
    constexpr std::uint8_t clearFeature = 1;
    return WaitedTransfer({toEndpoint, clearFeature, 0, endpoint}, {}).Do(*this);
}

}  // namespace

std::shared_ptr<UsbDevice> MakeUsbIpDevice(UsbIpConnector connect, std::string busId) {
    return std::make_shared<UsbIpDevice>(std::move(connect), std::move(busId));
}

}  // namespace Varnholt::Platform::Usb
