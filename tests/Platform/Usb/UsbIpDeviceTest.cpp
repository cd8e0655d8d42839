// The USB/IP client against a peer that the test plays.
#include <sys/socket.h>
#include <sys/time.h>

#include <optional>

#include "Platform/Usb/UsbIpDevice.h"
#include "Platform/Usb/UsbIpProtocol.h"
#include "Platform/Usb/UsbIpSocket.h"
#include "Support/Bytes.h"
#include "Support/SignalMasks.h"
#include "Support/TestTransfer.h"

namespace Varnholt::Platform::Usb {
namespace {

using Clock = std::chrono::steady_clock;
using namespace Protocol;
using namespace Tests;

Bytes ImportReply(UsbIp::OperationStatus status = UsbIp::OperationStatus::Ok) {
    const auto header =
        UsbIp::Encode(UsbIp::OperationHeader{UsbIp::ProtocolVersion, UsbIp::Operation::ImportReply, status});
    UsbIp::DeviceRecord record;
    record.busNumber = 3;
    record.deviceNumber = 4;
    return status == UsbIp::OperationStatus::Ok ? Join(header, UsbIp::Encode(record)) : Join(header);
}

class UsbIpDeviceTest : public testing::Test {
  protected:
    ~UsbIpDeviceTest() override { ClosePeer(); }

    /// A device whose peer has already sent `firstBytes`.
    std::shared_ptr<UsbDevice> MakeDevice(const Bytes& firstBytes = ImportReply()) {
        return MakeUsbIpDevice(
            [this, firstBytes](ErrorCode&) {
                ClosePeer();
                int files[2] = {-1, -1};
                EXPECT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, files));
                peer_ = files[1];
                const timeval patience{10, 0};
                setsockopt(peer_, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
                PeerSends(firstBytes);
                return files[0];
            },
            "1-1");
    }
    std::shared_ptr<UsbDevice> MakeClaimedDevice() {
        auto device = MakeDevice();
        EXPECT_EQ(Errors::Success, device->Claim());
        EXPECT_EQ(40U, PeerReceives(40).size());
        return device;
    }
    void ClosePeer() {
        if (peer_ >= 0) {
            close(std::exchange(peer_, -1));
        }
    }
    template <class Array>
    void PeerSends(const Array& bytes) {
        EXPECT_EQ(static_cast<ssize_t>(bytes.size()), send(peer_, bytes.data(), bytes.size(), MSG_NOSIGNAL));
    }
    Bytes PeerReceives(std::size_t size) {
        Bytes bytes(size);
        const ssize_t count = recv(peer_, bytes.data(), size, MSG_WAITALL);
        bytes.resize(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
        return bytes;
    }
    template <class Kind>
    Kind PeerReceivesPacket() {
        const Bytes received = PeerReceives(UsbIp::PacketHeaderSize);
        UsbIp::PacketBytes bytes{};
        std::ranges::copy(received, bytes.begin());
        const auto packet = UsbIp::DecodePacket(bytes);
        if (!packet || !std::holds_alternative<Kind>(*packet)) {
            ADD_FAILURE() << "another packet";
            return {};
        }
        return std::get<Kind>(*packet);
    }

    int peer_ = -1;
};

TEST_F(UsbIpDeviceTest, ImportAndPacketsAreWhatTheProtocolSays) {
    const auto device = MakeDevice();
    ASSERT_EQ(Errors::Success, device->Claim());
    EXPECT_EQ(Errors::Success, device->Claim()) << "it is this device's already";
    EXPECT_EQ(Join(Bytes{0x01, 0x11, 0x80, 0x03, 0, 0, 0, 0, '1', '-', '1'}, Bytes(29)), PeerReceives(40));

    TestTransfer request = TestTransfer::Vendor(Protocol::Request::Reset, {31});
    TestTransfer readout = TestTransfer::In(BulkInEndpoint, 256);
    ASSERT_EQ(Errors::Success, device->Submit(request));
    ASSERT_EQ(Errors::Success, device->Submit(readout));

    const auto first = PeerReceivesPacket<UsbIp::SubmitPacket>();
    EXPECT_EQ((UsbIp::SubmitPacket{first.sequence, 0x00030004, 0, 1, 0, {0x40, 0xCA, 0, 0, 1}, false}),
              first);
    EXPECT_EQ(Bytes{31}, PeerReceives(1));
    const auto second = PeerReceivesPacket<UsbIp::SubmitPacket>();
    EXPECT_EQ(
        (UsbIp::SubmitPacket{second.sequence, 0x00030004, BulkInEndpoint, 256, second.interval, {}, true}),
        second);
    EXPECT_NE(first.sequence, second.sequence);

    // Answered in the other order.
    PeerSends(Join(UsbIp::Encode(UsbIp::SubmitReply{second.sequence, 0, 3}), Bytes{7, 8, 9}));
    readout.ExpectEnd(TransferStatus::Completed);
    EXPECT_EQ((Bytes{7, 8, 9}), readout.Data());
    EXPECT_EQ(0, request.completions);
    PeerSends(UsbIp::Encode(UsbIp::SubmitReply{first.sequence, -32, 0}));
    request.ExpectEnd(TransferStatus::Stalled);
}

TEST_F(UsbIpDeviceTest, CancellationAndItsCrossings) {
    // With a status of the submission it is answered although the unlink has arrived.
    const auto device = MakeClaimedDevice();
    for (const auto& [name, submitStatus, data, unlinkStatus, expected] :
         std::vector<std::tuple<const char*, std::optional<std::int32_t>, Bytes, std::optional<std::int32_t>,
                                TransferStatus>>{
             {"only the transfer is answered", 0, {1}, std::nullopt, TransferStatus::Completed},
             {"unlinked", std::nullopt, {}, -104, TransferStatus::Cancelled},
             {"answered meanwhile", 0, {1, 2, 3, 4}, 0, TransferStatus::Completed},
             {"unlinked with data", -104, {1, 2}, 0, TransferStatus::Cancelled},
             {"the peer believes it has answered", std::nullopt, {}, 0, TransferStatus::Cancelled},
         }) {
        SCOPED_TRACE(name);
        TestTransfer transfer = TestTransfer::In(BulkInEndpoint, 4);
        ASSERT_EQ(Errors::Success, device->Submit(transfer));
        const auto submit = PeerReceivesPacket<UsbIp::SubmitPacket>();
        device->Cancel(transfer);
        device->Cancel(transfer);
        const auto unlink = PeerReceivesPacket<UsbIp::UnlinkPacket>();
        EXPECT_EQ(submit.sequence, unlink.victim);
        if (submitStatus) {
            const auto length = static_cast<std::uint32_t>(data.size());
            PeerSends(Join(UsbIp::Encode(UsbIp::SubmitReply{submit.sequence, *submitStatus, length}), data));
        }
        if (unlinkStatus) {
            PeerSends(UsbIp::Encode(UsbIp::UnlinkReply{unlink.sequence, *unlinkStatus}));
        } else {
            std::this_thread::sleep_for(std::chrono::milliseconds(1100));  // there is no limit any more
        }
        transfer.ExpectEnd(expected);
        EXPECT_EQ(data, transfer.Data());
        device->Cancel(transfer);
    }
    // The connection has survived it, and nothing more was sent.
    TestTransfer last = TestTransfer::In(BulkInEndpoint, 1);
    device->Submit(last);
    EXPECT_FALSE(last.Wait(std::chrono::milliseconds(1100)))
        << "a cancellation that was answered has no limit";
    const auto submit = PeerReceivesPacket<UsbIp::SubmitPacket>();
    PeerSends(Join(UsbIp::Encode(UsbIp::SubmitReply{submit.sequence, 0, 1}), Bytes{9}));
    last.ExpectEnd(TransferStatus::Completed);
}

TEST_F(UsbIpDeviceTest, PeerThatLeavesOrBreaksTheProtocolIsAnUnpluggedDevice) {
    // The answer's sequence number behind that of the submission, the bytes that it announces, those that are
    // sent with the header, and whether the peer leaves.
    for (const auto& [name, offset, announced, sent, leaves] :
         std::vector<std::tuple<const char*, std::uint32_t, std::uint32_t, std::size_t, bool>>{
             {"leaves", 0, 64, 0, true},
             {"leaves amid the data", 0, 64, 48 + 32, true},
             {"stops amid the data", 0, 64, 48 + 32, false},
             {"stops in the middle of a header", 0, 64, 20, false},
             {"answers what was not asked", 100, 0, 48, false},
             {"sends too much", 0, 65, 48 + 65, false},
             {"announces 4 GB", 0, 0xFFFFFFFF, 48, false},
         }) {
        SCOPED_TRACE(name);
        const auto device = MakeClaimedDevice();
        TestTransfer first = TestTransfer::In(BulkInEndpoint, 64);
        TestTransfer second = TestTransfer::Out(BulkOutEndpoint, Bytes(64));
        ASSERT_EQ(Errors::Success, device->Submit(first));
        ASSERT_EQ(Errors::Success, device->Submit(second));
        const std::uint32_t sequence = PeerReceivesPacket<UsbIp::SubmitPacket>().sequence + offset;
        Bytes reply = Join(UsbIp::Encode(UsbIp::SubmitReply{sequence, 0, announced}));
        reply.resize(sent);
        PeerSends(reply);
        if (leaves) {
            ClosePeer();
        }
        for (TestTransfer* const each : {&first, &second}) {
            each->ExpectEnd(TransferStatus::DeviceGone);
            EXPECT_EQ(0U, each->actualLength);
        }
        TestTransfer after = TestTransfer::In(BulkInEndpoint, 64);
        EXPECT_EQ(Errors::DeviceNotConnected, device->Submit(after));
        EXPECT_EQ(Errors::DeviceNotConnected, device->Claim());
        device->Release();
        EXPECT_EQ(Errors::Success, device->Claim()) << "a new connection";
        EXPECT_EQ(Errors::Success, device->Submit(after));
        device->Release();
        EXPECT_EQ(TransferStatus::Cancelled, after.status);
    }
}

TEST_F(UsbIpDeviceTest, SilentPeerDoesNotHoldUpACancellation) {
    const auto device = MakeClaimedDevice();
    TestTransfer cancelled = TestTransfer::In(BulkInEndpoint, 64);
    TestTransfer other = TestTransfer::In(Protocol::InterruptInEndpoint, 1);
    device->Submit(cancelled);
    device->Submit(other);
    EXPECT_FALSE(other.Wait(std::chrono::milliseconds(100)));
    ExpectOtherThreadsBlockHostSignals();
    const auto start = Clock::now();
    device->Cancel(cancelled);
    for (TestTransfer* const each : {&cancelled, &other}) {
        each->ExpectEnd(TransferStatus::DeviceGone);
    }
    EXPECT_LT(Clock::now() - start, std::chrono::seconds(3));
}

TEST_F(UsbIpDeviceTest, PeerMayReadSlowlyButHoldsUpNoSubmissionForEver) {
    constexpr std::size_t size = 4U << 20;
    const auto device = MakeClaimedDevice();
    TestTransfer taken = TestTransfer::Out(BulkOutEndpoint, Bytes(size));
    std::jthread peerThread([this] {
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
        EXPECT_EQ(48 + size, PeerReceives(48 + size).size());
    });
    ASSERT_EQ(Errors::Success, device->Submit(taken));
    peerThread.join();
    TestTransfer large = TestTransfer::Out(BulkOutEndpoint, Bytes(size));
    const auto start = Clock::now();
    ASSERT_EQ(Errors::Success, device->Submit(large));
    large.ExpectEnd(TransferStatus::DeviceGone);
    EXPECT_LT(Clock::now() - start, std::chrono::seconds(5));
    TestTransfer largest = TestTransfer::Out(BulkOutEndpoint, Bytes(UsbIp::MaximumPayload));
    EXPECT_EQ(Errors::DeviceNotConnected, device->Submit(largest));
    TestTransfer tooLarge = TestTransfer::Out(BulkOutEndpoint, Bytes(UsbIp::MaximumPayload + std::size_t{1}));
    EXPECT_EQ(Errors::InvalidParameter, device->Submit(tooLarge));
}

TEST_F(UsbIpDeviceTest, ImportFailuresAreToldApart) {
    Bytes otherOperation = ImportReply();
    otherOperation[3] = 0x05;
    Bytes half = ImportReply();
    half.resize(100);
    using Status = UsbIp::OperationStatus;
    for (const auto& [reply, expected] : {std::pair(ImportReply(Status::Busy), Errors::Busy),
                                          {ImportReply(Status::NotAvailable), Errors::Busy},
                                          {ImportReply(Status::NoDevice), Errors::DeviceNotConnected},
                                          {ImportReply(Status::Failed), Errors::GeneralFailure},
                                          {otherOperation, Errors::DeviceNotConnected},
                                          {{}, Errors::DeviceNotConnected},
                                          {half, Errors::DeviceNotConnected}}) {
        const auto device = MakeDevice(reply);
        const auto start = Clock::now();
        EXPECT_EQ(expected, device->Claim());
        EXPECT_LT(Clock::now() - start, std::chrono::seconds(5));
        TestTransfer transfer = TestTransfer::In(BulkInEndpoint, 1);
        EXPECT_EQ(Errors::DeviceNotConnected, device->Submit(transfer));
    }
    const auto unreachable = MakeUsbIpDevice(
        [](ErrorCode& error) {
            error = Errors::AccessDenied;
            return -1;
        },
        "1-1");
    EXPECT_EQ(Errors::AccessDenied, unreachable->Claim());
}

TEST_F(UsbIpDeviceTest, EndpointsOfADeviceThatDoesNotAnswerAreNotAnEmptyList) {
    const auto device = MakeClaimedDevice();
    std::jthread peerThread([this] {
        EXPECT_EQ((SetupPacket{0x80, 6, 0x0200, 0, 255}), PeerReceivesPacket<UsbIp::SubmitPacket>().setup);
        PeerSends(
            UsbIp::Encode(UsbIp::UnlinkReply{PeerReceivesPacket<UsbIp::UnlinkPacket>().sequence, -104}));
    });
    ErrorCode error = Errors::Success;
    EXPECT_TRUE(device->Endpoints(error).empty());
    EXPECT_EQ(Errors::SemaphoreTimeout, error);
    peerThread.join();
    ClosePeer();
    EXPECT_TRUE(device->Endpoints(error).empty());
    EXPECT_EQ(Errors::DeviceNotConnected, error);
}

TEST(UsbIpSocketTest, KeepsWhatIsNotTakenAndNoPeerOutlastsTheLimit) {
    int files[2] = {-1, -1};
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, files));
    UsbIpSocket socket(files[0]);
    const Bytes sent = Counting(6, 1);
    EXPECT_EQ(6, send(files[1], sent.data(), 6, 0));
    Bytes bytes(8);
    for (const std::size_t taken : {1U, 3U}) {
        EXPECT_TRUE(socket.Receive(std::span(bytes).subspan(0, taken), false));
    }
    EXPECT_EQ((Bytes{2, 3, 4}), Bytes(bytes.begin(), bytes.begin() + 3));
    EXPECT_EQ(1, send(files[1], sent.data(), 1, 0));
    bytes.resize(3);
    EXPECT_TRUE(socket.Receive(bytes, false));
    EXPECT_EQ((Bytes{5, 6, 1}), bytes) << "what is left, and what came later";
    socket.ReceiveUntil(Clock::now() - std::chrono::seconds(1));
    EXPECT_EQ(3, send(files[1], bytes.data(), 3, 0));
    EXPECT_FALSE(socket.Receive(bytes, false));
    close(files[1]);
}

}  // namespace
}  // namespace Varnholt::Platform::Usb
