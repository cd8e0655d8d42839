// The server's side of USB/IP, byte by byte.
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "Descriptors.h"
#include "FaultInjector.h"
#include "Protocol/ByteOrder.h"
#include "SimulatedInstrument.h"
#include "Simulator/ManualScheduler.h"
#include "UsbIpSession.h"

namespace Varnholt::Simulator {
namespace {

namespace UsbIp = Platform::Usb::UsbIp;
using Bytes = std::vector<std::uint8_t>;
using Platform::Usb::SetupPacket;
using Protocol::BulkInEndpoint;
using Protocol::Request;

/// Exports "1-1", which nobody gets.
class OneRecord final : public UsbIpExports {
  public:
    std::vector<UsbIp::DeviceRecord> List() override {
        UsbIp::DeviceRecord record;
        record.busId = "1-1";
        record.classes = {VendorClass, 0, 0};
        record.interfaces = 1;
        return {record};
    }
    Import ImportDevice(const std::string& busId) override {
        using Status = UsbIp::OperationStatus;
        return {busId == "1-1" ? Status::Busy : Status::NoDevice, {}, nullptr};
    }
};

/// A session with a peer that the test plays.
class Peer final {
  public:
    /// The session begins with exports, or with a device that was imported.
    template <class Beginning>
    explicit Peer(Beginning&& beginning)
        : session(std::make_unique<UsbIpSession>(std::forward<Beginning>(beginning), [] {})) {}

    void Send(const Bytes& bytes) { session->Receive(bytes); }
    Bytes Take() {
        const Bytes bytes(session->Output().begin(), session->Output().end());
        session->OutputSent(bytes.size());
        return bytes;
    }
    /// Submits a transfer with the next sequence number, which it answers.
    std::uint32_t Submit(std::uint8_t endpoint, std::uint32_t length, const SetupPacket& setup,
                         const Bytes& out = {}) {
        UsbIp::SubmitPacket packet;
        packet.sequence = ++sequence_;
        packet.endpoint = endpoint;
        packet.in = endpoint == 0 ? setup.IsIn() : (endpoint & 0x80) != 0;
        packet.length = length;
        packet.setup = setup;
        const UsbIp::PacketBytes header = UsbIp::Encode(packet);
        Send({header.begin(), header.end()});
        Send(out);
        return sequence_;
    }
    std::uint32_t In(std::uint8_t endpoint, std::uint32_t length) { return Submit(endpoint, length, {}); }
    std::uint32_t Vendor(Request request, const Bytes& data) {
        const auto length = static_cast<std::uint16_t>(data.size());
        return Submit(0, length, {Protocol::VendorOut, static_cast<std::uint8_t>(request), 0, 0, length},
                      data);
    }
    std::uint32_t Unlink(std::uint32_t victim) {
        const UsbIp::PacketBytes bytes = UsbIp::Encode(UsbIp::UnlinkPacket{++sequence_, 0, victim});
        Send({bytes.begin(), bytes.end()});
        return sequence_;
    }

    std::unique_ptr<UsbIpSession> session;

  private:
    std::uint32_t sequence_ = 0;
};

Bytes SubmitReply(std::uint32_t sequence, std::int32_t status, const Bytes& data) {
    const UsbIp::PacketBytes header =
        UsbIp::Encode(UsbIp::SubmitReply{sequence, status, static_cast<std::uint32_t>(data.size())});
    Bytes bytes(header.begin(), header.end());
    bytes.insert(bytes.end(), data.begin(), data.end());
    return bytes;
}
Bytes UnlinkReply(std::uint32_t sequence, std::int32_t status) {
    const UsbIp::PacketBytes header = UsbIp::Encode(UsbIp::UnlinkReply{sequence, status});
    return {header.begin(), header.end()};
}

class UsbIpSessionTest : public testing::Test {
  protected:
    std::shared_ptr<Platform::Usb::UsbDevice> Device(const std::string& faults = "") {
        return InjectFaults(SimulatedInstrument::Connect(instrument_),
                            std::make_shared<FaultScript>(FaultPlan::Parse(faults)), scheduler_);
    }

    ManualScheduler scheduler_;
    const std::shared_ptr<SimulatedInstrument> instrument_ =
        std::make_shared<SimulatedInstrument>(scheduler_);
    OneRecord exports_;
};

TEST_F(UsbIpSessionTest, ListsAndThenEnds) {
    Peer peer(exports_);
    peer.Send({0x01, 0x11, 0x80});
    EXPECT_TRUE(peer.Take().empty());
    peer.Send({0x05, 0, 0, 0, 0});
    const Bytes reply = peer.Take();
    ASSERT_EQ(8U + 4U + 312U + 4U, reply.size());
    EXPECT_EQ((Bytes{0x01, 0x11, 0x00, 0x05, 0, 0, 0, 0, 0, 0, 0, 1}),
              Bytes(reply.begin(), reply.begin() + 12));
    EXPECT_EQ((Bytes{0xFF, 0, 0, 0}), Bytes(reply.end() - 4, reply.end()));
    EXPECT_TRUE(peer.session->Over());
    EXPECT_EQ("", peer.session->Complaint());
}

TEST_F(UsbIpSessionTest, RefusedImportsAreAnsweredAndEndIt) {
    for (const std::string busId : {"1-1", "1-2"}) {
        Peer peer(exports_);
        peer.Send({0x01, 0x11, 0x80, 0x03, 0, 0, 0, 0});
        const UsbIp::BusIdBytes id = UsbIp::EncodeBusId(busId);
        peer.Send({id.begin(), id.end()});
        const auto status = static_cast<std::uint8_t>(exports_.ImportDevice(busId).status);
        EXPECT_EQ((Bytes{0x01, 0x11, 0x00, 0x03, 0, 0, 0, status}), peer.Take());
        EXPECT_TRUE(peer.session->Over());
    }
}

TEST_F(UsbIpSessionTest, UnlinkedTransferIsAnsweredOnce) {
    constexpr std::int32_t connectionReset = -104;
    Peer peer(Device());
    const std::uint32_t pending = peer.In(BulkInEndpoint, 64);
    std::uint32_t unlink = peer.Unlink(pending);
    EXPECT_EQ(UnlinkReply(unlink, connectionReset), peer.Take());
    unlink = peer.Unlink(pending);
    EXPECT_EQ(UnlinkReply(unlink, 0), peer.Take()) << "it is over already";
    unlink = peer.Unlink(12345);
    EXPECT_EQ(UnlinkReply(unlink, 0), peer.Take()) << "it never was";

    // Data that came in the meantime are not lost.
    Peer late(Device("bulk-in 0:late-cancel"));
    late.Vendor(Request::ReadEeprom, {0, 0, 0x10, 0, 0, 2, 0, 0});
    late.Take();
    const std::uint32_t victim = late.In(BulkInEndpoint, 64);
    EXPECT_TRUE(late.Take().empty());
    unlink = late.Unlink(victim);
    Bytes expected = SubmitReply(victim, connectionReset, {0x00, 0x01});
    const Bytes then = UnlinkReply(unlink, 0);
    expected.insert(expected.end(), then.begin(), then.end());
    EXPECT_EQ(expected, late.Take());
}

TEST_F(UsbIpSessionTest, UnpluggingEndsTheSessionWithoutAnswers) {
    Peer peer(Device());
    peer.In(BulkInEndpoint, 64);
    peer.In(Protocol::InterruptInEndpoint, 1);
    instrument_->Unplug();
    EXPECT_TRUE(peer.session->Over());
    EXPECT_TRUE(peer.Take().empty());

    Peer afterwards(Device());
    afterwards.In(BulkInEndpoint, 64);
    EXPECT_TRUE(afterwards.session->Over());
}

TEST_F(UsbIpSessionTest, RefusesPeersThatBreakTheProtocol) {
    const auto packet = [](const UsbIp::Packet& contents) {
        const UsbIp::PacketBytes bytes = UsbIp::Encode(contents);
        return Bytes(bytes.begin(), bytes.end());
    };
    UsbIp::SubmitPacket bulkIn;
    bulkIn.sequence = 1;
    bulkIn.endpoint = BulkInEndpoint;
    bulkIn.in = true;
    bulkIn.length = 64;
    UsbIp::SubmitPacket tooLong = bulkIn;
    tooLong.length = 0xFFFFFFFF;
    for (const Bytes& operation :
         {Bytes{0x01, 0x10, 0x80, 0x05, 0, 0, 0, 0}, Bytes{0x01, 0x11, 0x80, 0x07, 0, 0, 0, 0},
          Bytes{'G', 'E', 'T', ' ', '/', ' ', 'H', 'T'}}) {
        Peer peer(exports_);
        peer.Send(operation);
        EXPECT_TRUE(peer.session->Over());
        EXPECT_NE("", peer.session->Complaint());
    }
    for (const auto& packets : {
             std::vector<Bytes>{Bytes(48, 0xFF)},
             std::vector<Bytes>{packet(UsbIp::SubmitReply{1, 0, 0})},
             std::vector<Bytes>{packet(tooLong)},
             std::vector<Bytes>{packet(bulkIn), packet(bulkIn)},
         }) {
        Peer peer(Device());
        for (const Bytes& each : packets) {
            peer.Send(each);
        }
        EXPECT_TRUE(peer.session->Over());
        EXPECT_FALSE(peer.session->WantsInput());
    }
    Peer greedy(Device());
    for (int i = 0; i < 100 && !greedy.session->Over(); ++i) {
        greedy.In(BulkInEndpoint, UsbIp::MaximumPayload);
    }
    EXPECT_TRUE(greedy.session->Over());
    greedy.session.reset();
    EXPECT_EQ(0U, instrument_->PendingTransfers());
}

TEST_F(UsbIpSessionTest, PeerThatDoesNotReadIsNotServedFurther) {
    Peer peer(Device());
    std::size_t asked = 0;
    while (peer.session->WantsInput()) {
        peer.Submit(0, 18, {0x80, 6, 0x0100, 0, 18});
        ++asked;
    }
    const std::size_t size = peer.session->Output().size();
    EXPECT_LT(size, std::size_t{5} << 20);
    peer.session->OutputSent(size - 1);
    EXPECT_TRUE(peer.session->WantsInput());
    peer.Submit(0, 18, {0x80, 6, 0x0100, 0, 18});
    EXPECT_EQ(1 + size / asked, peer.Take().size());

    // Nor are the rest of the packets that came together with the one that was too many.
    InstrumentSettings endless;
    endless.scanBytes = std::uint64_t{1} << 40;
    Peer hungry(SimulatedInstrument::Connect(std::make_shared<SimulatedInstrument>(scheduler_, endless)));
    hungry.Vendor(Request::Measure, {});
    hungry.Take();
    Bytes packets;
    UsbIp::SubmitPacket packet;
    packet.endpoint = BulkInEndpoint;
    packet.in = true;
    packet.length = 1U << 20;
    for (packet.sequence = 100; packet.sequence < 150; ++packet.sequence) {
        const UsbIp::PacketBytes bytes = UsbIp::Encode(packet);
        packets.insert(packets.end(), bytes.begin(), bytes.end());
    }
    EXPECT_EQ(4U * UsbIp::PacketHeaderSize, hungry.session->Receive(packets));
    EXPECT_LT(hungry.session->Output().size(), std::size_t{6} << 20);
}

}  // namespace
}  // namespace Varnholt::Simulator
