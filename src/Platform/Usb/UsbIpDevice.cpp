#include "Platform/Usb/UsbIpDevice.h"

#include <algorithm>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <new>
#include <thread>
#include <utility>

#include "Platform/Posix/HostSignalsBlocked.h"
#include "Platform/Usb/UsbDescriptors.h"
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
    WaitedTransfer(const SetupPacket& packet, std::vector<std::uint8_t>& buffer) {
        setup = packet;
        data = buffer.data();
        length = static_cast<std::uint32_t>(buffer.size());
        client = this;
    }

    ErrorCode Do(UsbDevice& device) {
        if (const ErrorCode code = device.Submit(*this); code != Errors::Success) {
            return code;
        }
        std::unique_lock lock(mutex);
        if (!completion.wait_for(lock, RequestPatience, [this] { return completed; })) {
            lock.unlock();
            device.Cancel(*this);
            lock.lock();
            completion.wait(lock, [this] { return completed; });
        }
        switch (status) {
            case TransferStatus::Completed:
                return Errors::Success;
            case TransferStatus::DeviceGone:
                return Errors::DeviceNotConnected;
            case TransferStatus::Cancelled:
                return Errors::SemaphoreTimeout;
            default:
                return Errors::GeneralFailure;
        }
    }

  private:
    void TransferCompleted(Transfer&) noexcept override {
        const std::lock_guard lock(mutex);
        completed = true;
        completion.notify_all();
    }

    std::mutex mutex;
    std::condition_variable completion;
    bool completed = false;
};

class UsbIpDevice final : public UsbDevice {
  public:
    UsbIpDevice(UsbIpConnector connector, std::string id)
        : connect(std::move(connector)), busId(std::move(id)) {}
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
    std::uint32_t NextSequence() { return ++lastSequence == 0 ? ++lastSequence : lastSequence; }
    void LimitReceiving();

    const UsbIpConnector connect;
    const std::string busId;

    bool Claimed();

    std::mutex claimMutex;  // taken first; held while what follows changes
    std::unique_ptr<UsbIpSocket> socket;
    std::uint32_t deviceId = 0;
    std::thread reader;
    std::vector<EndpointInfo> endpoints;

    std::mutex sendMutex;  // taken second: packets leave in the order in which they are entered below
    std::mutex mutex;      // taken last; guards what follows
    std::vector<Running> running;
    std::uint32_t lastSequence = 0;
    bool connected = false;
    std::optional<Clock::time_point> releaseLimit;  // set while the claim is being given back
};

ErrorCode UsbIpDevice::Claim() {
    const std::lock_guard claimLock(claimMutex);
    if (socket) {
        const std::lock_guard lock(mutex);
        return connected ? Errors::Success : Errors::DeviceNotConnected;
    }
    ErrorCode error = Errors::Success;
    std::unique_ptr<UsbIpSocket> newSocket = ConnectUsbIp(connect, error);
    if (!newSocket) {
        return error;
    }
    if (error = ImportUsbIpDevice(*newSocket, busId, deviceId); error != Errors::Success) {
        return error;
    }
    socket = std::move(newSocket);
    {
        const std::lock_guard lock(mutex);
        connected = true;
        releaseLimit.reset();
    }
    try {
        const Posix::HostSignalsBlocked blocked;
        reader = std::thread([this] { Listen(); });
    } catch (const std::exception&) {  // no thread, or no memory for it
        socket.reset();
        const std::lock_guard lock(mutex);
        connected = false;
        error = Errors::NoSystemResources;
    }
    return error;
}

void UsbIpDevice::Release() {
    const std::lock_guard claimLock(claimMutex);
    if (!socket) {
        return;
    }
    {
        const std::lock_guard lock(mutex);
        releaseLimit = Clock::now() + ClosePatience;
        LimitReceiving();
    }
    // Once the peer has closed its end, too, the device is free for the next who wants it.
    socket->ShutdownSending();
    reader.join();
    const std::lock_guard sendLock(sendMutex);  // nobody is sending any more
    socket.reset();
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

    const std::lock_guard sendLock(sendMutex);
    {
        const std::lock_guard lock(mutex);
        if (!connected || releaseLimit) {
            return Errors::DeviceNotConnected;
        }
        packet.sequence = NextSequence();
        transfer.actualLength = 0;
        running.push_back({&transfer, packet.sequence});
    }
    packet.deviceId = deviceId;
    const std::span<const std::uint8_t> payload(transfer.data, packet.in ? 0 : packet.length);
    if (!socket->Send(UsbIp::Encode(packet), payload)) {
        socket->Shutdown();  // the reader ends every transfer, this one too
    }
    return Errors::Success;
} catch (const std::bad_alloc&) {
    return Errors::NotEnoughMemory;
}

void UsbIpDevice::Cancel(Transfer& transfer) {
    const std::lock_guard sendLock(sendMutex);
    UsbIp::UnlinkPacket packet;
    {
        const std::lock_guard lock(mutex);
        const auto found = std::ranges::find(running, &transfer, &Running::transfer);
        if (found == running.end() || found->unlinkSequence != 0) {
            return;
        }
        packet.sequence = found->unlinkSequence = NextSequence();
        packet.victim = found->sequence;
        found->unlinkLimit = Clock::now() + UnlinkPatience;
        LimitReceiving();
    }
    packet.deviceId = deviceId;
    if (!socket->Send(UsbIp::Encode(packet), {})) {
        socket->Shutdown();
    }
}

void UsbIpDevice::LimitReceiving() {
    std::optional<Clock::time_point> limit = releaseLimit;
    for (const Running& each : running) {
        if (each.transfer && each.unlinkSequence != 0 && (!limit || each.unlinkLimit < *limit)) {
            limit = each.unlinkLimit;
        }
    }
    socket->ReceiveUntil(limit);
}

void UsbIpDevice::Listen() {
    const auto handle = [this](const auto& packet) {
        if constexpr (requires { HandleReply(packet); }) {
            return HandleReply(packet);
        }
        return false;
    };
    UsbIp::PacketBytes bytes{};
    while (socket->Receive(bytes, false)) {
        const auto packet = UsbIp::DecodePacket(bytes);
        if (!packet || !std::visit(handle, *packet)) {
            break;
        }
    }
    socket->Shutdown();
    std::vector<Running> left;
    TransferStatus status = TransferStatus::DeviceGone;
    {
        const std::lock_guard lock(mutex);
        connected = false;
        left.swap(running);
        status = releaseLimit ? TransferStatus::Cancelled : TransferStatus::DeviceGone;
    }
    for (const Running& each : left) {
        if (each.transfer) {
            each.transfer->status = status;
            each.transfer->client->TransferCompleted(*each.transfer);
        }
    }
}

bool UsbIpDevice::HandleReply(const UsbIp::SubmitReply& reply) {
    Transfer* transfer = nullptr;
    {
        const std::lock_guard lock(mutex);
        const auto found = std::ranges::find(running, reply.sequence, &Running::sequence);
        if (found == running.end() || !found->transfer) {
            return false;
        }
        transfer = found->transfer;
    }
    if (reply.actualLength > transfer->length ||
        (transfer->IsIn() && !socket->Receive({transfer->data, reply.actualLength}, true))) {
        return false;
    }
    {
        const std::lock_guard lock(mutex);
        const auto found = std::ranges::find(running, reply.sequence, &Running::sequence);
        if (found->unlinkSequence == 0) {
            running.erase(found);
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
        const std::lock_guard lock(mutex);
        const auto found = std::ranges::find(running, reply.sequence, &Running::unlinkSequence);
        if (found == running.end() || reply.sequence == 0) {
            return false;
        }
        transfer = found->transfer;
        running.erase(found);
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
    error = Errors::Success;
    {
        const std::lock_guard claimLock(claimMutex);
        if (!endpoints.empty()) {
            return endpoints;
        }
    }
    // The descriptors come over the connection, which there is only during a claim.
    const bool claimed = Claimed();
    std::vector<EndpointInfo> found;
    if (!claimed) {
        error = Claim();
    }
    if (error == Errors::Success) {
        constexpr SetupPacket getConfiguration{0x80, 6, 0x0200, 0, 255};
        std::vector<std::uint8_t> bytes(getConfiguration.length);
        WaitedTransfer transfer(getConfiguration, bytes);
        error = transfer.Do(*this);
        if (error == Errors::Success) {
            bytes.resize(transfer.actualLength);
            found = EndpointsOfFirstInterface(bytes);
        }
        if (!claimed) {
            Release();
        }
    }
    const std::lock_guard claimLock(claimMutex);
    endpoints = found;
    return found;
}

bool UsbIpDevice::Claimed() {
    const std::lock_guard claimLock(claimMutex);
    return socket != nullptr;
}

ErrorCode UsbIpDevice::ClearHalt(std::uint8_t endpoint) {
    constexpr std::uint8_t toEndpoint = 0x02;
    constexpr std::uint8_t clearFeature = 1;
    std::vector<std::uint8_t> nothing;
    return WaitedTransfer({toEndpoint, clearFeature, 0, endpoint, 0}, nothing).Do(*this);
}

}  // namespace

std::shared_ptr<UsbDevice> MakeUsbIpDevice(UsbIpConnector connect, std::string busId) {
    return std::make_shared<UsbIpDevice>(std::move(connect), std::move(busId));
}

}  // namespace Varnholt::Platform::Usb
