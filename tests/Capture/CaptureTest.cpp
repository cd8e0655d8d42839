// What a recording holds, byte by byte, where tools that read pcapng and usbmon look for it.

#include <tuple>

#include "Capture/DescribeRequest.h"
#include "Capture/PcapngWriter.h"
#include "Capture/UsbCapture.h"
#include "Support/HookedUsb.h"
#include "Support/TestFolder.h"
#include "Support/TestTransfer.h"

namespace Varnholt::Tests {
namespace {

using namespace Protocol;

std::string TextOf(const Bytes& bytes, std::size_t start, std::size_t size) {
    return start + size <= bytes.size() ? Hex(&bytes[start], size) : "cut short";
}

/// A packet block: its number, event, transfer type, endpoint, device/bus, flags for setup and data, status,
/// length and captured length, setup, data, and its comment.
std::string TextOfPacket(const Bytes& block) {
    const auto number = [&block](std::size_t at) { return std::to_string(LoadLittle32(&block[at])); };
    const std::uint64_t time = std::uint64_t{LoadLittle32(&block[12])} << 32 | LoadLittle32(&block[16]);
    const auto age = std::chrono::system_clock::now().time_since_epoch() - std::chrono::microseconds(time);
    EXPECT_LT(std::chrono::abs(age), std::chrono::minutes(10));
    EXPECT_EQ(time, LoadLittle32(&block[44]) * std::uint64_t{1'000'000} + LoadLittle32(&block[52]));
    EXPECT_EQ(TextOf(block, 48, 4) + TextOf(block, 8, 4), "00 00 00 0000 00 00 00");
    const std::uint64_t id = std::uint64_t{LoadLittle32(&block[32])} << 32 | LoadLittle32(&block[28]);
    EXPECT_EQ(TextOf(block, 76, 16), Hex(Bytes(16).data(), 16)) << "of isochronous transfers only";
    const std::size_t size = LoadLittle32(&block[20]);
    EXPECT_EQ(size, LoadLittle32(&block[24]));
    std::string text = std::to_string(id) + " " + static_cast<char>(block[36]) + " " + TextOf(block, 37, 2) +
                       " " + std::to_string(block[39]) + "/" + std::to_string(LoadLittle16(&block[40])) +
                       " " + TextOf(block, 42, 2) + " " +
                       std::to_string(static_cast<std::int32_t>(LoadLittle32(&block[56]))) + " " +
                       number(60) + " " + number(64) + " [" + TextOf(block, 68, 8) + "] " +
                       TextOf(block, 92, size - 64);
    std::size_t option = (28 + size + 3) / 4 * 4;
    if (option + 4 < block.size()) {
        const std::size_t length = LoadLittle16(&block[option + 2]);
        EXPECT_EQ(LoadLittle16(&block[option]), 1U) << "a comment";
        const auto comment = block.begin() + static_cast<std::ptrdiff_t>(option) + 4;
        text += "; " + std::string(comment, comment + static_cast<std::ptrdiff_t>(length));
        option += (4 + length + 3) / 4 * 4 + 4;
        EXPECT_EQ(LoadLittle32(&block[option - 4]), 0U) << "the end of the options";
    }
    EXPECT_EQ(option + 4, block.size());
    return text;
}

/// The blocks of a file as text; those in front of the packets as they are.
std::string TextOfFile(const std::string& path) {
    const Bytes file = ReadFile(path);
    std::string text;
    for (std::size_t at = 0; at + 12 <= file.size();) {
        const std::uint32_t length = LoadLittle32(&file[at + 4]);
        EXPECT_EQ(TextOf(file, at + 4, 4), TextOf(file, at + length - 4, 4)) << "at " << at;
        if (length < 12 || length % 4 != 0 || at + length > file.size()) {
            return text + "a block of " + std::to_string(length);
        }
        const auto start = file.begin() + static_cast<std::ptrdiff_t>(at);
        const Bytes block(start, start + static_cast<std::ptrdiff_t>(length));
        text += (LoadLittle32(&block[0]) == 6 ? TextOfPacket(block) : TextOf(block, 0, length)) + "\n";
        at += length;
    }
    return text;
}

TEST(CaptureTest, HoldsEveryTransferAsUsbmonDoes) {
    const TestFolder folder;
    const std::string path = folder.Path("capture");
    HookedBus bus;
    const auto device = std::make_shared<HookedDevice>();
    bus.devices = {{"a", std::make_shared<HookedDevice>()}, {"b", device}};
    Capture::PcapngWriter writer(path, "test 1");
    EXPECT_FALSE(ReadFile(path).empty()) << "who watches it grow sees its beginning at once";
    Capture::CapturingBus recorded(bus);
    Platform::ErrorCode error = 0;
    EXPECT_EQ(recorded.Open("b", error), device);
    recorded.RecordInto(writer);
    EXPECT_EQ(recorded.List(), bus.List());
    EXPECT_NE(recorded.Open("a", error), nullptr);
    EXPECT_NE(recorded.Open("b", error), nullptr);
    const auto captured = recorded.Open("b", error);
    bus.openAnswer = Platform::Errors::Busy;
    EXPECT_EQ(recorded.Open("b", error), nullptr);
    EXPECT_EQ(error, Platform::Errors::Busy);

    const auto play = [&](TestTransfer&& transfer, TransferStatus status, std::uint32_t moved) {
        device->AnswerAtOnce(status, moved);
        EXPECT_EQ(captured->Submit(transfer), 0U);
        transfer.ExpectEnd(status);
        EXPECT_EQ(transfer.actualLength, moved);
    };
    play(TestTransfer::Vendor(Request::WriteEeprom, {0, 0, 1, 2, 0, 3, 0, 0}, 0x1234),
         TransferStatus::Completed, 8);
    play(TestTransfer::VendorQuestion(Request::GetMeasureMode, 6), TransferStatus::Completed, 3);
    play(TestTransfer::Control({0x80, 6, 0x0100, 0x0203, 4}, Bytes(4)), TransferStatus::Completed, 2);
    play(TestTransfer::Out(Protocol::BulkOutEndpoint, {7, 8, 9}), TransferStatus::Stalled, 2);
    play(TestTransfer::In(Protocol::BulkInEndpoint, 300), TransferStatus::Overflow, 1);
    play(TestTransfer::In(Protocol::InterruptInEndpoint, 8), TransferStatus::Cancelled, 0);
    play(TestTransfer::In(Protocol::BulkInEndpoint, 1), TransferStatus::IoError, 0);
    play(TestTransfer::In(Protocol::BulkInEndpoint, 1), TransferStatus::DeviceGone, 0);
    for (const auto code : {Platform::Errors::GeneralFailure, Platform::Errors::DeviceNotConnected}) {
        device->onSubmit = [code](Transfer&) { return code; };
        TestTransfer refused = TestTransfer::In(Protocol::BulkInEndpoint, 1);
        EXPECT_EQ(captured->Submit(refused), code);
        EXPECT_EQ(refused.completions, 0);
    }
    TestTransfer early = TestTransfer::In(Protocol::BulkInEndpoint, 1);
    device->onSubmit = [&](Transfer&) {
        captured->Cancel(early);  // before the device has it
        return Platform::Errors::Success;
    };
    EXPECT_EQ(captured->Submit(early), 0U);
    EXPECT_EQ(early.status, TransferStatus::Cancelled);
    const TestTransfer direct = TestTransfer::In(Protocol::BulkInEndpoint, 1);
    writer.Write({0x500000007, false, 127, &direct, "words"});
    EXPECT_FALSE(writer.Failed());
    EXPECT_EQ(TextOfFile(path),
              "0A 0D 0D 0A 2C 00 00 00 4D 3C 2B 1A 01 00 00 00 FF FF FF FF FF FF FF FF "
              "04 00 06 00 74 65 73 74 20 31 00 00 00 00 00 00 2C 00 00 00\n"
              "01 00 00 00 14 00 00 00 DC 00 00 00 00 00 00 00 14 00 00 00\n"
              "1 S 02 00 2/1 00 00 -115 8 8 [40 C3 34 12 00 00 08 00] 00 00 01 02 00 03 00 00"
              "; WriteEEPROM address=258 length=3\n"
              "1 C 02 00 2/1 2D 3E 0 8 0 [00 00 00 00 00 00 00 00] ; WriteEEPROM address=258 length=3\n"
              "2 S 02 80 2/1 00 3C -115 6 0 [C0 D1 00 00 00 00 06 00] ; GetMeasureMode\n"
              "2 C 02 80 2/1 2D 00 0 3 3 [00 00 00 00 00 00 00 00] 00 01 02; GetMeasureMode m1=0 m2=1 m3=2\n"
              "3 S 02 80 2/1 00 3C -115 4 0 [80 06 00 01 03 02 04 00] \n"
              "3 C 02 80 2/1 2D 00 0 2 2 [00 00 00 00 00 00 00 00] 00 01\n"
              "4 S 03 03 2/1 2D 00 -115 3 3 [00 00 00 00 00 00 00 00] 07 08 09\n"
              "4 C 03 03 2/1 2D 3E -32 2 0 [00 00 00 00 00 00 00 00] \n"
              "5 S 03 82 2/1 2D 3C -115 300 0 [00 00 00 00 00 00 00 00] \n"
              "5 C 03 82 2/1 2D 00 -75 1 1 [00 00 00 00 00 00 00 00] 00\n"
              "6 S 01 84 2/1 2D 3C -115 8 0 [00 00 00 00 00 00 00 00] \n"
              "6 C 01 84 2/1 2D 3C -104 0 0 [00 00 00 00 00 00 00 00] \n"
              "7 S 03 82 2/1 2D 3C -115 1 0 [00 00 00 00 00 00 00 00] \n"
              "7 C 03 82 2/1 2D 3C -71 0 0 [00 00 00 00 00 00 00 00] \n"
              "8 S 03 82 2/1 2D 3C -115 1 0 [00 00 00 00 00 00 00 00] \n"
              "8 C 03 82 2/1 2D 3C -108 0 0 [00 00 00 00 00 00 00 00] \n"
              "9 S 03 82 2/1 2D 3C -115 1 0 [00 00 00 00 00 00 00 00] \n"
              "9 C 03 82 2/1 2D 3C -71 0 0 [00 00 00 00 00 00 00 00] \n"
              "10 S 03 82 2/1 2D 3C -115 1 0 [00 00 00 00 00 00 00 00] \n"
              "10 C 03 82 2/1 2D 3C -108 0 0 [00 00 00 00 00 00 00 00] \n"
              "11 S 03 82 2/1 2D 3C -115 1 0 [00 00 00 00 00 00 00 00] \n"
              "11 C 03 82 2/1 2D 3C -104 0 0 [00 00 00 00 00 00 00 00] \n"
              "21474836487 S 03 82 127/1 2D 3C -115 1 0 [00 00 00 00 00 00 00 00] ; words\n");
    EXPECT_TRUE(Capture::PcapngWriter(folder.Path("none/capture"), "test").Failed());
}

TEST(DescribeRequestTest, SaysWhatTheBytesMean) {
    for (const auto& [request, size, text] : std::vector<std::tuple<int, std::size_t, std::string>>{
             {0xA0, 8, "DownloadRAMFirmware address=0x20AB"},
             {0xC2, 8, "GetMeasureParameters p1=258 p2=772 p3=1286 p4=7 p5=8"},
             {0xC1, 7, "SetMeasureParameters p1=258 p2=772 p3=1286 p4=7"},
             {0xC4, 6, "ReadEEPROM address=16909060 length=1286"},
             {0xC7, 6, "WriteCPLD c1=258 c2=772 c3=1286"},
             {0xC8, 2, "ReadCPLD value=258"},
             {0xC9, 8, "GetMISC m1=7 m2=258 m3=8 m4=772 m5=1286"},
             {0xCB, 8, "DownloadEEPROMFirmware address=16909060 length=1286"},
             {0xCF, 1, "SetMeasureMode mode=1"},
             {0xD1, 6, "GetMeasureMode m1=1 m2=2 m3=3 m4=4 m5=5 m6=6"},
             {0xD2, 8, "GetChipID"},
             {0x9F, 8, "vendor request 0x9F"},
         }) {
        EXPECT_EQ(Capture::DescribeRequest(static_cast<std::uint8_t>(request), 0x20AB, Counting(size, 1)),
                  text);
    }
}

}  // namespace
}  // namespace Varnholt::Tests
