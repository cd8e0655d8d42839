// The server's side of USB/IP, byte by byte.
#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <random>
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
using Protocol::BulkOutEndpoint;
using Protocol::Request;

/// Exports one instrument under "1-1".
class OneInstrument final : public UsbIpExports {
  public:
    explicit OneInstrument(std::shared_ptr<SimulatedInstrument> exported) : instrument(std::move(exported)) {}

    std::vector<UsbIp::DeviceRecord> List() override {
        UsbIp::DeviceRecord record;
        record.busId = "1-1";
        record.classes = {VendorClass, 0, 0};
        record.interfaces = 1;
        return {record};
    }
    Import ImportDevice(const std::string& busId) override {
        if (busId != "1-1") {
            return {UsbIp::OperationStatus::NoDevice, {}, nullptr};
        }
        auto device = SimulatedInstrument::Connect(instrument);
        if (device->Claim() != Platform::Errors::Success) {
            return {UsbIp::OperationStatus::Busy, {}, nullptr};
        }
        return {UsbIp::OperationStatus::Ok, List().front(), std::move(device)};
    }

  private:
    const std::shared_ptr<SimulatedInstrument> instrument;
};

/// A session with a peer that the test plays.
class Peer final {
  public:
    explicit Peer(UsbIpExports& exports)
        : session(std::make_unique<UsbIpSession>(exports, [this] { ++notifications; })) {}
    explicit Peer(std::shared_ptr<Platform::Usb::UsbDevice> device)
        : session(std::make_unique<UsbIpSession>(std::move(device), [this] { ++notifications; })) {}

    void Send(const Bytes& bytes) { session->Receive(bytes); }
    Bytes Take() {
        const Bytes bytes(session->Output().begin(), session->Output().end());
        session->OutputSent(bytes.size());
        return bytes;
    }
    void Import(const std::string& busId) {
        Send({0x01, 0x11, 0x80, 0x03, 0, 0, 0, 0});
        const UsbIp::BusIdBytes id = UsbIp::EncodeBusId(busId);
        Send({id.begin(), id.end()});
    }
    /// Submits a transfer with the next sequence number, which it answers.
    std::uint32_t Submit(std::uint8_t endpoint, std::uint32_t length, const SetupPacket& setup,
                         const Bytes& out) {
        UsbIp::SubmitPacket packet;
        packet.sequence = ++sequence;
        packet.endpoint = endpoint;
        packet.in = endpoint == 0 ? setup.IsIn() : (endpoint & 0x80) != 0;
        packet.length = length;
        packet.setup = setup;
        const UsbIp::PacketBytes header = UsbIp::Encode(packet);
        Send({header.begin(), header.end()});
        Send(out);
        return sequence;
    }
    std::uint32_t In(std::uint8_t endpoint, std::uint32_t length) { return Submit(endpoint, length, {}, {}); }
    std::uint32_t Ask(std::uint8_t type, std::uint8_t request, std::uint16_t value, std::uint16_t length,
                      std::uint16_t index = 0) {
        return Submit(0, length, {type, request, value, index, length}, {});
    }
    std::uint32_t Vendor(Request request, const Bytes& data) {
        const auto length = static_cast<std::uint16_t>(data.size());
        return Submit(0, length, {Protocol::VendorOut, static_cast<std::uint8_t>(request), 0, 0, length},
                      data);
    }
    std::uint32_t Unlink(std::uint32_t victim) {
        const UsbIp::PacketBytes bytes = UsbIp::Encode(UsbIp::UnlinkPacket{++sequence, 0, victim});
        Send({bytes.begin(), bytes.end()});
        return sequence;
    }

    std::unique_ptr<UsbIpSession> session;
    int notifications = 0;

  private:
    std::uint32_t sequence = 0;
};

Bytes SubmitReply(std::uint32_t sequence, std::int32_t status, const Bytes& data, bool in = true) {
    const UsbIp::PacketBytes header =
        UsbIp::Encode(UsbIp::SubmitReply{sequence, status, static_cast<std::uint32_t>(data.size())});
    Bytes bytes(header.begin(), header.end());
    if (in) {
        bytes.insert(bytes.end(), data.begin(), data.end());
    }
    return bytes;
}
Bytes UnlinkReply(std::uint32_t sequence, std::int32_t status) {
    const UsbIp::PacketBytes header = UsbIp::Encode(UsbIp::UnlinkReply{sequence, status});
    return {header.begin(), header.end()};
}

class UsbIpSessionTest : public testing::Test {
  protected:
    std::shared_ptr<Platform::Usb::UsbDevice> Device(const std::string& faults = "") {
        return InjectFaults(SimulatedInstrument::Connect(instrument),
                            std::make_shared<FaultScript>(FaultPlan::Parse(faults)), scheduler);
    }

    ManualScheduler scheduler;
    const std::shared_ptr<SimulatedInstrument> instrument = std::make_shared<SimulatedInstrument>(scheduler);
    OneInstrument exports{instrument};
};

TEST_F(UsbIpSessionTest, ListsAndThenEnds) {
    Peer peer(exports);
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

TEST_F(UsbIpSessionTest, ImportsOneAtATime) {
    Peer first(exports);
    first.Import("1-1");
    EXPECT_EQ(8U + 312U, first.Take().size());
    EXPECT_TRUE(instrument->Claimed());

    struct Case {
        std::string busId;
        UsbIp::OperationStatus status;
    };
    for (const Case& test :
         {Case{"1-1", UsbIp::OperationStatus::Busy}, Case{"1-2", UsbIp::OperationStatus::NoDevice}}) {
        Peer second(exports);
        second.Import(test.busId);
        EXPECT_EQ((Bytes{0x01, 0x11, 0x00, 0x03, 0, 0, 0, static_cast<std::uint8_t>(test.status)}),
                  second.Take());
        EXPECT_TRUE(second.session->Over());
    }
    const std::uint32_t pending = first.In(BulkInEndpoint, 64);
    EXPECT_NE(0U, pending);
    first.session.reset();
    EXPECT_FALSE(instrument->Claimed());
    EXPECT_EQ(0U, instrument->PendingTransfers());
}

/// What a Linux kernel sends to a device that has just been attached, and its ways with it later.
TEST_F(UsbIpSessionTest, AnswersWhatAKernelAsks) {
    Peer peer(Device());
    const Bytes device = Descriptor(0x0100, "");
    const Bytes configuration = Descriptor(0x0200, "");
    const Bytes serial = Descriptor(0x0303, instrument->Settings().serial);
    struct Case {
        const char* name;
        std::uint8_t type;
        std::uint8_t request;
        std::uint16_t value;
        std::uint16_t index;
        std::uint16_t length;
        std::int32_t status;
        Bytes answer;
    };
    for (const Case& test : {
             Case{"device", 0x80, 6, 0x0100, 0, 64, 0, device},
             Case{"device again", 0x80, 6, 0x0100, 0, 18, 0, device},
             Case{"qualifier", 0x80, 6, 0x0600, 0, 10, -32, {}},
             Case{"start of configuration",
                  0x80,
                  6,
                  0x0200,
                  0,
                  9,
                  0,
                  {configuration.begin(), configuration.begin() + 9}},
             Case{"configuration", 0x80, 6, 0x0200, 0, static_cast<std::uint16_t>(configuration.size()), 0,
                  configuration},
             Case{"languages", 0x80, 6, 0x0300, 0, 4, 0, {4, 3, 9, 4}},
             Case{"serial", 0x80, 6, 0x0303, 0x0409, 255, 0, serial},
             Case{"no such string", 0x80, 6, 0x0309, 0x0409, 255, -32, {}},
             Case{"set configuration", 0x00, 9, 1, 0, 0, 0, {}},
             Case{"get configuration", 0x80, 8, 0, 0, 1, 0, {1}},
             Case{"get interface", 0x81, 10, 0, 0, 1, 0, {0}},
             Case{"set interface", 0x01, 11, 0, 0, 0, 0, {}},
             Case{"status", 0x80, 0, 0, 0, 2, 0, {1, 0}},
             Case{"endpoint status", 0x82, 0, 0, 0x82, 2, 0, {0, 0}},
             Case{"clear halt", 0x02, 1, 0, 0x82, 0, 0, {}},
             Case{"clear halt of another", 0x02, 1, 0, 0x81, 0, -32, {}},
         }) {
        const std::uint32_t sequence = peer.Ask(test.type, test.request, test.value, test.length, test.index);
        EXPECT_EQ(SubmitReply(sequence, test.status, test.answer), peer.Take()) << test.name;
    }
    EXPECT_FALSE(peer.session->Over());
}

TEST_F(UsbIpSessionTest, CommandsAndDataGoBothWays) {
    Peer peer(Device());
    std::uint32_t sequence = peer.Vendor(Request::WriteEeprom, {0, 0, 0, 16, 0, 2, 0, 0});
    EXPECT_EQ(SubmitReply(sequence, 0, Bytes(8), false), peer.Take());
    sequence = peer.Submit(BulkOutEndpoint, 2, {}, {0x12, 0x34});
    EXPECT_EQ(SubmitReply(sequence, 0, Bytes(2), false), peer.Take());
    EXPECT_EQ(0x12, instrument->Eeprom()[16]);
    EXPECT_EQ(0x34, instrument->Eeprom()[17]);

    const std::uint32_t waiting = peer.In(BulkInEndpoint, 4);
    EXPECT_TRUE(peer.Take().empty());
    sequence = peer.Vendor(Request::ReadEeprom, {0, 0, 0, 16, 0, 2, 0, 0});
    Bytes expected = SubmitReply(sequence, 0, Bytes(8), false);
    const Bytes data = SubmitReply(waiting, 0, {0x12, 0x34});
    expected.insert(expected.end(), data.begin(), data.end());
    EXPECT_EQ(expected, peer.Take());
    EXPECT_GT(peer.notifications, 0);
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
    instrument->Unplug();
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
        Peer peer(exports);
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
    EXPECT_EQ(0U, instrument->PendingTransfers());
}

TEST_F(UsbIpSessionTest, PeerThatDoesNotReadIsNotServedFurther) {
    Peer peer(Device());
    std::size_t asked = 0;
    while (peer.session->WantsInput()) {
        peer.Ask(0x80, 6, 0x0100, 18);
        ++asked;
    }
    const std::size_t size = peer.session->Output().size();
    EXPECT_LT(size, std::size_t{5} << 20);
    peer.session->OutputSent(size - 1);
    EXPECT_TRUE(peer.session->WantsInput());
    peer.Ask(0x80, 6, 0x0100, 18);
    EXPECT_EQ(1 + size / asked, peer.Take().size());

    // Nor are the rest of the packets that came together with the one that was too many.
    InstrumentSettings endless;
    endless.scanBytes = std::uint64_t{1} << 40;
    Peer hungry(SimulatedInstrument::Connect(std::make_shared<SimulatedInstrument>(scheduler, endless)));
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

TEST_F(UsbIpSessionTest, SurvivesAnyBytes) {
    std::mt19937 random(7);
    for (int round = 0; round < 2000; ++round) {
        const bool imported = round % 2 == 0;
        auto peer = imported ? std::make_unique<Peer>(Device()) : std::make_unique<Peer>(exports);
        if (round % 4 == 1) {
            peer->Import("1-1");
        }
        for (int piece = 0; piece < 20; ++piece) {
            UsbIp::PacketBytes bytes{};
            for (std::uint8_t& byte : bytes) {
                byte = random() % 8 == 0 ? static_cast<std::uint8_t>(random() % 6) : std::uint8_t{0};
            }
            bytes[3] = static_cast<std::uint8_t>(1 + random() % 2);
            bytes[0x1A] = 0;
            bytes[19] = static_cast<std::uint8_t>(random() % 5);
            peer->Send({bytes.begin(), bytes.end()});
        }
    }
    EXPECT_EQ(0U, instrument->PendingTransfers());
    EXPECT_FALSE(instrument->Claimed());
}

}  // namespace
}  // namespace Varnholt::Simulator
