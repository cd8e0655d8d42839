#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <vector>

#include "Platform/Usb/UsbDescriptors.h"
#include "Platform/Usb/UsbIpProtocol.h"

namespace Varnholt::Platform::Usb {
namespace {

using Bytes = std::vector<std::uint8_t>;

template <class Array>
Bytes ToBytes(const Array& array) {
    return {array.begin(), array.end()};
}
template <class Array>
Bytes Part(const Array& array, std::size_t start, std::size_t length) {
    return {array.begin() + static_cast<std::ptrdiff_t>(start),
            array.begin() + static_cast<std::ptrdiff_t>(start + length)};
}

TEST(UsbIpProtocolTest, PacketsHaveTheirFieldsWhereAKernelLooksForThem) {
    struct Case {
        const char* name;
        UsbIp::Packet packet;
        Bytes start;  ///< the rest of the 48 bytes is zero
    };
    UsbIp::SubmitPacket control;
    control.sequence = 0x01020304;
    control.deviceId = 0x00010002;
    control.length = 8;
    control.setup = {0x40, 0xC1, 0x1122, 0x3344, 0x0008};
    UsbIp::SubmitPacket bulkIn;
    bulkIn.sequence = 5;
    bulkIn.deviceId = 0x00010002;
    bulkIn.endpoint = 0x82;
    bulkIn.in = true;
    bulkIn.length = 0x10000;
    for (const Case& test : {
             Case{"control out",
                  control,
                  {0,    0,    0,    1,    1,    2,    3, 4, 0, 1, 0, 2, 0, 0, 0, 0, 0, 0, 0, 0,  //
                   0,    0,    0,    0,    0,    0,    0, 8, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0,  //
                   0x40, 0xC1, 0x22, 0x11, 0x44, 0x33, 8, 0}},
             Case{"bulk in", bulkIn, {0, 0, 0, 1, 0, 0, 0, 5, 0, 1, 0, 2, 0, 0, 0, 1, 0, 0, 0, 2,  //
                                      0, 0, 2, 0, 0, 1, 0, 0}},
             Case{"unlink", UsbIp::UnlinkPacket{7, 0x00010002, 5}, {0, 0, 0, 2, 0, 0, 0, 7, 0, 1, 0, 2,
                                                                    0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 5}},
             Case{"submit reply",
                  UsbIp::SubmitReply{5, -32, 0x100},
                  {0, 0, 0, 3, 0, 0, 0,    5,    0,    0,    0, 0, 0, 0,
                   0, 0, 0, 0, 0, 0, 0xFF, 0xFF, 0xFF, 0xE0, 0, 0, 1, 0}},
             Case{"unlink reply",
                  UsbIp::UnlinkReply{7, -104},
                  {0, 0, 0, 4, 0, 0, 0, 7, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0xFF, 0xFF, 0xFF, 0x98}},
         }) {
        Bytes expected = test.start;
        expected.resize(48);
        const UsbIp::PacketBytes bytes = UsbIp::Encode(test.packet);
        EXPECT_EQ(expected, ToBytes(bytes)) << test.name;
        EXPECT_EQ(test.packet, UsbIp::DecodePacket(bytes)) << test.name;
    }
}

TEST(UsbIpProtocolTest, RefusesPacketsThatCannotBeServed) {
    UsbIp::SubmitPacket submit;
    submit.sequence = 1;
    submit.endpoint = 0x82;
    submit.in = true;
    submit.length = UsbIp::MaximumPayload;
    const UsbIp::PacketBytes good = UsbIp::Encode(submit);
    ASSERT_TRUE(UsbIp::DecodePacket(good));
    struct Case {
        const char* name;
        std::size_t offset;
        std::uint8_t value;
        bool accepted;
    };
    for (const Case& test : {
             Case{"unknown command", 3, 5, false},
             Case{"command 0", 3, 0, false},
             Case{"direction", 15, 2, false},
             Case{"endpoint number", 19, 16, false},
             Case{"endpoint's high byte", 16, 1, false},
             Case{"one byte too long", 0x1B, 1, false},
             Case{"isochronous", 0x23, 1, false},
             Case{"flags do not matter", 0x17, 0xFF, true},
         }) {
        UsbIp::PacketBytes bytes = good;
        bytes[test.offset] = test.value;
        EXPECT_EQ(test.accepted, UsbIp::DecodePacket(bytes).has_value()) << test.name;
    }
    UsbIp::PacketBytes noPackets = good;
    std::fill_n(noPackets.begin() + 0x20, 4, std::uint8_t{0xFF});
    EXPECT_TRUE(UsbIp::DecodePacket(noPackets)) << "the other way to write no isochronous packets";
    EXPECT_FALSE(UsbIp::DecodePacket(UsbIp::Encode(UsbIp::SubmitReply{1, 0, UsbIp::MaximumPayload + 1})));
}

TEST(UsbIpProtocolTest, AnyHeaderDecodesToNothingOrToItself) {
    std::mt19937 random(1);
    for (int round = 0; round < 20000; ++round) {
        UsbIp::PacketBytes bytes{};
        for (std::uint8_t& byte : bytes) {
            byte = random() % 4 == 0 ? static_cast<std::uint8_t>(random()) : std::uint8_t{0};
        }
        bytes[3] = static_cast<std::uint8_t>(random() % 6);
        if (const auto packet = UsbIp::DecodePacket(bytes)) {
            EXPECT_EQ(packet, UsbIp::DecodePacket(UsbIp::Encode(*packet)));
        }
    }
}

TEST(UsbIpProtocolTest, DeviceRecordsAreCutToTheirFields) {
    UsbIp::DeviceRecord record;
    record.path = "/simulated/one";
    record.busId = "1-2";
    record.busNumber = 1;
    record.deviceNumber = 2;
    record.vendorId = 0x1209;
    record.productId = 0x0001;
    record.version = 0x0100;
    record.classes = {0xFF, 1, 2};
    record.configurationValue = 1;
    record.configurations = 1;
    record.interfaces = 1;
    const UsbIp::DeviceRecordBytes bytes = UsbIp::Encode(record);
    EXPECT_EQ((Bytes{'1', '-', '2', 0}), Part(bytes, 256, 4));
    EXPECT_EQ((Bytes{0, 0, 0, 1, 0, 0, 0, 2, 0, 0, 0, 3, 0x12, 0x09, 0, 1, 1, 0, 0xFF, 1, 2, 1, 1, 1}),
              Part(bytes, 288, 24));
    EXPECT_EQ(record, UsbIp::DecodeDeviceRecord(bytes));
    EXPECT_EQ(0x00010002U, record.DeviceId());

    record.path = std::string(300, 'x');
    record.busId = std::string(300, 'y');
    const UsbIp::DeviceRecord cut = UsbIp::DecodeDeviceRecord(UsbIp::Encode(record));
    EXPECT_EQ(std::string(255, 'x'), cut.path);
    EXPECT_EQ(std::string(31, 'y'), cut.busId);
    UsbIp::BusIdBytes unterminated{};
    unterminated.fill('z');
    EXPECT_EQ(std::string(32, 'z'), UsbIp::DecodeBusId(unterminated));
}

TEST(UsbDescriptorsTest, OnlyTheFirstInterfaceCountsAndBrokenOnesEndTheSearch) {
    const Bytes interface0{9, 4, 0, 0, 1, 0xFF, 0, 0, 0};
    const Bytes alternate1{9, 4, 0, 1, 1, 0xFF, 0, 0, 0};
    const Bytes bulk{7, 5, 0x82, 2, 0x00, 0x02, 0};
    const Bytes interrupt{7, 5, 0x84, 3, 0x08, 0x00, 4};
    struct Case {
        const char* name;
        std::vector<Bytes> parts;
        std::vector<int> addresses;
    };
    for (const Case& test : {
             Case{"nothing", {}, {}},
             Case{"two endpoints", {interface0, bulk, interrupt}, {0x82, 0x84}},
             Case{"other settings", {interface0, bulk, alternate1, interrupt}, {0x82}},
             Case{"no interface", {bulk}, {}},
             Case{"unknown descriptor between", {interface0, {3, 0x99, 7}, bulk}, {0x82}},
             Case{"length 0", {interface0, {0, 5}, bulk}, {}},
             Case{"longer than what there is", {interface0, bulk, {7, 5, 0x84, 3, 8}}, {0x82}},
             Case{"endpoint too short", {interface0, {4, 5, 0x84, 3}, bulk}, {0x82}},
         }) {
        Bytes all;
        for (const Bytes& part : test.parts) {
            all.insert(all.end(), part.begin(), part.end());
        }
        std::vector<int> addresses;
        for (const EndpointInfo& endpoint : EndpointsOfFirstInterface(all)) {
            addresses.push_back(endpoint.address);
        }
        EXPECT_EQ(test.addresses, addresses) << test.name;
    }
}

}  // namespace
}  // namespace Varnholt::Platform::Usb
