#include <gtest/gtest.h>

#include <algorithm>
#include <utility>

#include "Platform/Usb/UsbDescriptors.h"
#include "Platform/Usb/UsbIpProtocol.h"
#include "Protocol/ByteOrder.h"
#include "Support/Bytes.h"

namespace Varnholt::Platform::Usb {
namespace {

using Tests::Bytes;

template <class Array>
Bytes Part(const Array& array, std::size_t start, std::size_t length) {
    const auto first = array.begin() + static_cast<std::ptrdiff_t>(start);
    return {first, first + static_cast<std::ptrdiff_t>(length)};
}

TEST(UsbIpProtocolTest, PacketsHaveTheirFieldsWhereAKernelLooksForThem) {
    const UsbIp::SubmitPacket control{0x01020304, 0x10002, 0, 8, 0, {0x40, 0xC1, 0x1122, 0x3344, 8}, false};
    const UsbIp::SubmitPacket bulkIn{5, 0x10002, 0x82, 0x10000, 0, {}, true};
    // Words of 32 bits, most significant byte first; behind these the rest of the twelve is zero.
    const std::vector<std::tuple<const char*, UsbIp::Packet, std::vector<std::uint32_t>>> cases{
        {"control out", control, {1, 0x01020304, 0x10002, 0, 0, 0, 8, 0, 0, 0, 0x40C12211, 0x44330800}},
        {"bulk in", bulkIn, {1, 5, 0x10002, 1, 2, 0x200, 0x10000}},
        {"unlink", UsbIp::UnlinkPacket{7, 0x10002, 5}, {2, 7, 0x10002, 0, 0, 5}},
        {"submit reply", UsbIp::SubmitReply{5, -32, 0x100}, {3, 5, 0, 0, 0, 0xFFFFFFE0, 0x100}},
        {"unlink reply", UsbIp::UnlinkReply{7, -104}, {4, 7, 0, 0, 0, 0xFFFFFF98}},
    };
    for (const auto& [name, packet, words] : cases) {
        Bytes expected(48);
        for (std::size_t i = 0; i < words.size(); ++i) {
            Protocol::StoreBig32(&expected[4 * i], words[i]);
        }
        const UsbIp::PacketBytes bytes = UsbIp::Encode(packet);
        EXPECT_EQ(expected, Part(bytes, 0, 48)) << name;
        EXPECT_EQ(packet, UsbIp::DecodePacket(bytes)) << name;
    }
}

TEST(UsbIpProtocolTest, RefusesPacketsThatCannotBeServed) {
    const UsbIp::PacketBytes good =
        UsbIp::Encode(UsbIp::SubmitPacket{1, 0, 0x82, UsbIp::MaximumPayload, 0, {}, true});
    ASSERT_TRUE(UsbIp::DecodePacket(good));
    for (const auto& [name, offset, value, accepted] :
         std::vector<std::tuple<const char*, std::size_t, std::uint8_t, bool>>{
             {"unknown command", 3, 5, false},
             {"command 0", 3, 0, false},
             {"direction", 15, 2, false},
             {"last endpoint", 19, 15, true},
             {"endpoint number", 19, 16, false},
             {"endpoint's high byte", 16, 1, false},
             {"one byte too long", 0x1B, 1, false},
             {"isochronous", 0x23, 1, false},
             {"flags do not matter", 0x17, 0xFF, true},
         }) {
        UsbIp::PacketBytes bytes = good;
        bytes[offset] = value;
        EXPECT_EQ(accepted, UsbIp::DecodePacket(bytes).has_value()) << name;
    }
    UsbIp::PacketBytes noPackets = good;
    std::fill_n(noPackets.begin() + 0x20, 4, std::uint8_t{0xFF});
    EXPECT_TRUE(UsbIp::DecodePacket(noPackets)) << "the other way to write no isochronous packets";
    for (const std::uint32_t excess : {0U, 1U}) {
        const UsbIp::SubmitReply reply{1, 0, UsbIp::MaximumPayload + excess};
        EXPECT_EQ(excess == 0, UsbIp::DecodePacket(UsbIp::Encode(reply)).has_value());
    }
}

/// The kernel's own numbers: EPIPE, EPROTO, EOVERFLOW, ECONNRESET, ENODEV; and ENOENT, ESHUTDOWN and any
/// other, which it sends as well.
TEST(UsbIpProtocolTest, StatusesAreTheNumbersOfLinux) {
    const std::pair<std::int32_t, TransferStatus> sent[] = {
        {0, TransferStatus::Completed},  {-32, TransferStatus::Stalled},    {-71, TransferStatus::IoError},
        {-75, TransferStatus::Overflow}, {-104, TransferStatus::Cancelled}, {-19, TransferStatus::DeviceGone},
    };
    for (const auto& [number, status] : sent) {
        EXPECT_EQ(UsbIp::StatusOf(status), number);
        EXPECT_EQ(UsbIp::TransferStatusOf(number), status) << number;
    }
    EXPECT_EQ(UsbIp::TransferStatusOf(-2), TransferStatus::Cancelled);
    EXPECT_EQ(UsbIp::TransferStatusOf(-108), TransferStatus::DeviceGone);
    for (const std::int32_t other : {-1, -3, -110, 1, 32}) {
        EXPECT_EQ(UsbIp::TransferStatusOf(other), TransferStatus::IoError) << other;
    }
}

TEST(UsbIpProtocolTest, DeviceRecordsAreCutToTheirFields) {
    UsbIp::DeviceRecord record{"/simulated/one", "1-2",        1, 2, 3, 0x1209, 0x0001,
                               0x0100,           {0xFF, 1, 2}, 1, 1, 1};
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
    const Bytes interface0{9, 4, 0, 0, 1, 0xFF, 0, 0, 0}, interface1{9, 4, 1, 0, 1, 0xFF, 0, 0, 0};
    const Bytes alternate1{9, 4, 0, 1, 1, 0xFF, 0, 0, 0};
    const Bytes bulk{7, 5, 0x82, 2, 0x00, 0x02, 0}, interrupt{7, 5, 0x84, 3, 0x08, 0x00, 4};
    const std::string foundBulk = "82 2 512;", foundInterrupt = "84 3 8;";
    for (const auto& [name, parts, expected] :
         std::vector<std::tuple<const char*, std::vector<Bytes>, std::string>>{
             {"nothing", {}, ""},
             {"two endpoints", {interface0, bulk, interrupt}, foundBulk + foundInterrupt},
             {"other settings", {interface0, bulk, alternate1, interrupt}, foundBulk},
             {"other interfaces", {interface1, bulk, interface0, interrupt}, foundInterrupt},
             {"no interface", {bulk}, ""},
             {"unknown descriptor between", {interface0, {3, 0x99, 7}, bulk}, foundBulk},
             {"length 0", {interface0, {0, 5}, bulk}, ""},
             {"length 1", {interface0, {1}, bulk}, ""},
             {"an interface of 2 bytes", {interface0, {2, 4}, bulk}, foundBulk},
             {"an interface of 3 bytes", {interface0, {3, 4, 0}, bulk}, foundBulk},
             {"an interface of 4 bytes", {{4, 4, 0, 0}, bulk}, foundBulk},
             {"an endpoint of 2 bytes", {interface0, {2, 5}, bulk}, foundBulk},
             {"an endpoint of 5 bytes", {interface0, {5, 5, 0x84, 3, 8}, bulk}, foundBulk},
             {"an endpoint of 6 bytes", {interface0, {6, 5, 0x84, 3, 8, 0}}, foundInterrupt},
             {"longer than what there is", {interface0, bulk, {7, 5, 0x84, 3, 8, 0}}, foundBulk},
             {"a length at the end", {interface0, bulk, {7}}, foundBulk},
         }) {
        Bytes all;
        for (const Bytes& part : parts) {
            all.insert(all.end(), part.begin(), part.end());
        }
        std::string endpoints;
        for (const EndpointInfo& endpoint : EndpointsOfFirstInterface(all)) {
            endpoints += Tests::Hex(&endpoint.address, 1) + " " + std::to_string(endpoint.attributes) + " " +
                         std::to_string(endpoint.maximumPacketSize) + ";";
        }
        EXPECT_EQ(expected, endpoints) << name;
    }
}

}  // namespace
}  // namespace Varnholt::Platform::Usb
