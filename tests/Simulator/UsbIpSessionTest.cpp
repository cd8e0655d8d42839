// The server's side of USB/IP, byte by byte.
#include <gtest/gtest.h>

#include <memory>

#include "FaultInjector.h"
#include "Protocol/Instrument.h"
#include "SimulatedInstrument.h"
#include "Support/Bytes.h"
#include "UsbIpSession.h"

namespace Varnholt::Simulator {
namespace {

namespace UsbIp = Platform::Usb::UsbIp;
using Platform::Usb::SetupPacket;
using namespace Protocol;
using Tests::Bytes;

Bytes Packet(const UsbIp::Packet& packet, const Bytes& data = {}) {
    return Tests::Join(UsbIp::Encode(packet), data);
}

/// A session with a peer that the test plays.
class Peer final {
  public:
    explicit Peer(std::shared_ptr<Platform::Usb::UsbDevice> imported) : session(std::move(imported), [] {}) {}

    void Send(const Bytes& bytes) { session.Receive(bytes); }
    Bytes Take() {
        const Bytes bytes(session.Output().begin(), session.Output().end());
        session.OutputSent(bytes.size());
        return bytes;
    }
    /// Submits a transfer with the next sequence number, which it answers.
    std::uint32_t In(std::uint8_t endpoint, std::uint32_t length, const SetupPacket& setup = {}) {
        Send(Packet(UsbIp::SubmitPacket{++sequence_, 0, endpoint, length, 0, setup, true}));
        return sequence_;
    }
    void Vendor(Request request, const Bytes& data) {
        const auto length = static_cast<std::uint16_t>(data.size());
        const SetupPacket setup{Protocol::VendorOut, static_cast<std::uint8_t>(request), 0, 0, length};
        Send(Packet(UsbIp::SubmitPacket{++sequence_, 0, 0, length, 0, setup, false}, data));
    }
    std::uint32_t Unlink(std::uint32_t victim) {
        Send(Packet(UsbIp::UnlinkPacket{++sequence_, 0, victim}));
        return sequence_;
    }

    UsbIpSession session;

  private:
    std::uint32_t sequence_ = 0;
};

class UsbIpSessionTest : public testing::Test {
  protected:
    std::shared_ptr<Platform::Usb::UsbDevice> Device(const std::string& faults = "") {
        return InjectFaults(SimulatedInstrument::Connect(instrument_),
                            std::make_shared<FaultScript>(FaultPlan::Parse(faults)),
                            Platform::ClockScheduler());
    }

    const std::shared_ptr<SimulatedInstrument> instrument_ =
        std::make_shared<SimulatedInstrument>(Platform::ClockScheduler());
};

TEST_F(UsbIpSessionTest, UnlinkedTransferIsAnsweredOnce) {
    constexpr std::int32_t connectionReset = -104;
    Peer peer(Device());
    const std::uint32_t pending = peer.In(BulkInEndpoint, 64);
    std::uint32_t unlink = peer.Unlink(pending);
    EXPECT_EQ(Packet(UsbIp::UnlinkReply{unlink, connectionReset}), peer.Take());
    for (const std::uint32_t unknown : {pending, 12345U}) {
        unlink = peer.Unlink(unknown);
        EXPECT_EQ(Packet(UsbIp::UnlinkReply{unlink, 0}), peer.Take()) << "it is over, or never was";
    }
    // Data that came in the meantime are not lost.
    Peer late(Device("bulk-in 0:late-cancel"));
    late.Vendor(Request::ReadEeprom, {0, 0, 0x10, 0, 0, 2, 0, 0});
    late.Take();
    const std::uint32_t victim = late.In(BulkInEndpoint, 64);
    EXPECT_TRUE(late.Take().empty());
    unlink = late.Unlink(victim);
    EXPECT_EQ(Tests::Join(Packet(UsbIp::SubmitReply{victim, connectionReset, 2}, {0x00, 0x01}),
                          Packet(UsbIp::UnlinkReply{unlink, 0})),
              late.Take());
}

TEST_F(UsbIpSessionTest, PeerThatDoesNotReadIsNotServedFurtherNorOneThatAsksForTooMuch) {
    Peer peer(Device());
    std::size_t asked = 0;
    for (; peer.session.WantsInput(); ++asked) {
        peer.In(0, 18, {0x80, 6, 0x0100, 0, 18});
    }
    const std::size_t size = peer.session.Output().size();
    EXPECT_LT(size, std::size_t{5} << 20);
    peer.session.OutputSent(size - 1);
    EXPECT_TRUE(peer.session.WantsInput());
    peer.In(0, 18, {0x80, 6, 0x0100, 0, 18});
    EXPECT_EQ(1 + size / asked, peer.Take().size());

    // Nor are the rest of the packets that came together with the one that was too many.
    const InstrumentSettings endless{.scanBytes = std::uint64_t{1} << 40};
    Peer hungry(SimulatedInstrument::Connect(
        std::make_shared<SimulatedInstrument>(Platform::ClockScheduler(), endless)));
    hungry.Vendor(Request::Measure, {});
    hungry.Take();
    Bytes packets;
    for (std::uint32_t sequence = 100; sequence < 150; ++sequence) {
        packets = Tests::Join(
            packets, Packet(UsbIp::SubmitPacket{sequence, 0, BulkInEndpoint, 1U << 20, 0, {}, true}));
    }
    EXPECT_EQ(4U * UsbIp::PacketHeaderSize, hungry.session.Receive(packets));
    EXPECT_LT(hungry.session.Output().size(), std::size_t{6} << 20);

    Peer greedy(Device());
    for (int i = 0; i < 100 && !greedy.session.Over(); ++i) {
        greedy.In(BulkInEndpoint, UsbIp::MaximumPayload);
    }
    EXPECT_TRUE(greedy.session.Over());
}

}  // namespace
}  // namespace Varnholt::Simulator
