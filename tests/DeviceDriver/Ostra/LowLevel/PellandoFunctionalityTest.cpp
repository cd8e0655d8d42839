#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <numeric>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "Support/RecordingTransport.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using testing::ElementsAre;
using Tests::RecordingTransport;
using Utilities::Exceptions::InvalidArgumentException;
using Utilities::Exceptions::NullPointerException;
using Utilities::Tools::SmartPointer;

class PellandoFunctionalityTest : public testing::Test {
  protected:
    RecordingTransport::Log log;
    PellandoFunctionality instrument{SmartPointer<PellandoFunctionalityByte>(new RecordingTransport(log))};

    std::vector<std::string> CallsOf(const std::function<void()>& operation) {
        log.calls.clear();
        operation();
        return log.calls;
    }
};

TEST_F(PellandoFunctionalityTest, OpeningResetsOnceWithCode31) {
    EXPECT_THAT(log.calls, ElementsAre("Reset 001F"));
}

TEST_F(PellandoFunctionalityTest, EepromWritesGoInPiecesOf256) {
    std::vector<std::uint8_t> data(257);
    std::iota(data.begin(), data.end(), std::uint8_t{0});
    EXPECT_THAT(CallsOf([&] { instrument.WriteEEPROM(0x1000, data); }),
                ElementsAre("WriteEEPROM 00001000 0100 data=256", "WriteEEPROM 00001100 0001 data=1"));
    EXPECT_EQ(log.written[1], std::vector<std::uint8_t>{data[256]});
    data.resize(256);
    EXPECT_EQ(CallsOf([&] { instrument.WriteEEPROM(0, data); }).size(), 1U);
    EXPECT_TRUE(CallsOf([&] { instrument.WriteEEPROM(0, {}); }).empty());
}

TEST_F(PellandoFunctionalityTest, EepromReadsArePaddedTo64AndCutBack) {
    for (const auto& [wanted, call] :
         std::vector<std::pair<std::size_t, std::string>>{{64, "ReadEEPROM 00000010 0040 data=64"},
                                                          {100, "ReadEEPROM 00000010 0080 data=128"},
                                                          {1, "ReadEEPROM 00000010 0040 data=64"}}) {
        std::vector<std::uint8_t> data(wanted);
        log.answers.push_back({0xAB});
        EXPECT_THAT(CallsOf([&] { instrument.ReadEEPROM(0x10, data); }), ElementsAre(call));
        EXPECT_EQ(data.size(), wanted);
        EXPECT_EQ(data[0], 0xAB);
    }
}

TEST_F(PellandoFunctionalityTest, LengthsThatTheWireCannotCarryAreRefused) {
    std::vector<std::uint8_t> nothing;
    std::vector<std::uint8_t> tooMuch(0x10000);
    log.calls.clear();
    EXPECT_THROW(instrument.ReadEEPROM(0, nothing), InvalidArgumentException);
    EXPECT_THROW(instrument.ReadEEPROM(0, tooMuch), InvalidArgumentException);
    EXPECT_THROW(instrument.DownloadFirmware(0, nothing, true), InvalidArgumentException);
    EXPECT_THROW(instrument.DownloadFirmware(0, tooMuch, false), InvalidArgumentException);
    EXPECT_TRUE(log.calls.empty());
}

TEST_F(PellandoFunctionalityTest, ValuesTravelHighByteFirst) {
    EXPECT_THAT(CallsOf([&] { instrument.SetMeasureParameters(300, 0, 0xFFFE, 6); }),
                ElementsAre("SetMeasureParameters 012C 0000 FFFE 6"));
    EXPECT_THAT(CallsOf([&] { instrument.WriteCPLD(1, 0x1234, 3); }),
                ElementsAre("WriteCPLD 0001 1234 0003"));
    EXPECT_THAT(CallsOf([&] { instrument.Reset(0x0102); }), ElementsAre("Reset 0102"));

    std::uint16_t p1 = 0, p2 = 0, p3 = 0;
    std::uint8_t p4 = 0, p5 = 0;
    log.answers = {{0x01, 0x2C, 0, 2, 0xFF, 0, 7, 8}};
    instrument.GetMeasureParameters(p1, p2, p3, p4, p5);
    EXPECT_THAT((std::vector<int>{p1, p2, p3, p4, p5}), ElementsAre(300, 2, 0xFF00, 7, 8));

    std::uint8_t m1 = 0, m3 = 0;
    std::uint16_t m2 = 0, m4 = 0, m5 = 0;
    log.answers = {{0x01, 0x2D, 0, 4, 0, 5, 1, 3}};
    instrument.GetMISC(m1, m2, m3, m4, m5);
    EXPECT_THAT((std::vector<int>{m1, m2, m3, m4, m5}), ElementsAre(1, 301, 3, 4, 5));

    std::uint16_t cpld = 0;
    log.answers = {{0x80, 0x01}};
    instrument.ReadCPLD(cpld);
    EXPECT_EQ(cpld, 0x8001);
}

TEST_F(PellandoFunctionalityTest, FirmwareGoesToTheMemoryAskedFor) {
    const std::vector<std::uint8_t> image(3);
    EXPECT_THAT(CallsOf([&] { instrument.DownloadFirmware(0x1234, image, false); }),
                ElementsAre("DownloadRAMFirmware 4660 data=3"));
    EXPECT_THAT(CallsOf([&] { instrument.DownloadFirmware(0x1234, image, true); }),
                ElementsAre("DownloadEEPROMFirmware 00001234 0003 data=3"));
}

TEST_F(PellandoFunctionalityTest, ScanDataSizeSaysWhenNothingIsLeft) {
    std::uint8_t record[4] = {};
    std::uint32_t size = sizeof record;
    log.answers = {{1, 2, 3, 4}};
    instrument.GetScanData(record, size);
    EXPECT_EQ(size, 4U);
    instrument.GetScanData(record, size);
    EXPECT_EQ(size, 0U);
}

TEST(PellandoFunctionality, AnEmptyTransportIsRefused) {
    EXPECT_THROW(PellandoFunctionality(SmartPointer<PellandoFunctionalityByte>()), NullPointerException);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
