#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "FakeCommands.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using Utilities::Exceptions::InvalidArgumentException;
using Utilities::Exceptions::NullPointerException;
using Utilities::Tools::SmartPointer;

class PellandoFunctionalityTest : public testing::Test {
  protected:
    FakeInstrument fake_{.eeprom = Bytes(0x2000)};
    const SmartPointer<PellandoFunctionality> instrument_ = Open(fake_);
};

TEST_F(PellandoFunctionalityTest, EepromTransfersHaveTheirSizes) {
    Bytes data(257, 1);
    data[256] = 2;
    instrument_->WriteEEPROM(0x1000, data);
    EXPECT_THAT(fake_.TakeCommands(),
                ElementsAre(Command{"WriteEEPROM", 0x1000, 256}, Command{"WriteEEPROM", 0x1100, 1}));
    EXPECT_EQ(fake_.eeprom[0x1100], 2);
    data.resize(256);
    instrument_->WriteEEPROM(0, data);
    instrument_->WriteEEPROM(0, {});
    EXPECT_THAT(fake_.TakeCommands(), ElementsAre(Command{"WriteEEPROM", 0, 256}));

    for (const auto& [wanted, padded] : {std::pair{64U, 64U}, {100U, 128U}, {1U, 64U}}) {
        data.assign(wanted, 0);
        instrument_->ReadEEPROM(0x10C0, data);
        EXPECT_THAT(fake_.TakeCommands(), ElementsAre(Command{"ReadEEPROM", 0x10C0, padded}));
        EXPECT_EQ(data, Bytes(&fake_.eeprom[0x10C0], &fake_.eeprom[0x10C0] + wanted));
    }
}

TEST_F(PellandoFunctionalityTest, LengthsThatTheWireCannotCarryAreRefused) {
    Bytes nothing, tooMuch(0x10000);
    EXPECT_THROW(instrument_->ReadEEPROM(0, nothing), InvalidArgumentException);
    EXPECT_THROW(instrument_->ReadEEPROM(0, tooMuch), InvalidArgumentException);
    EXPECT_THROW(instrument_->DownloadFirmware(0, nothing, true), InvalidArgumentException);
    EXPECT_THROW(instrument_->DownloadFirmware(0, tooMuch, false), InvalidArgumentException);
    EXPECT_THAT(fake_.commands, IsEmpty());
    EXPECT_NO_THROW(instrument_->DownloadFirmware(0, Bytes(0xFFFF), false));
}

TEST_F(PellandoFunctionalityTest, ValuesKeepTheirPlacesAndOrder) {
    instrument_->SetMeasureParameters(300, 2, 0xFFFE, 6);
    EXPECT_THAT((std::vector<int>{fake_.p1, fake_.p2, fake_.p3, fake_.p4}), ElementsAre(300, 2, 0xFFFE, 6));
    fake_.p5 = 8;
    std::uint16_t p1 = 0, p2 = 0, p3 = 0, m2 = 0, m4 = 0, m5 = 0;
    std::uint8_t p4 = 0, p5 = 0, m1 = 0, m3 = 0;
    instrument_->GetMeasureParameters(p1, p2, p3, p4, p5);
    EXPECT_THAT((std::vector<int>{p1, p2, p3, p4, p5}), ElementsAre(300, 2, 0xFFFE, 6, 8));

    fake_.misc1 = 1, fake_.misc2 = 301, fake_.misc3 = 3, fake_.misc4 = 4, fake_.misc5 = 5;
    instrument_->GetMISC(m1, m2, m3, m4, m5);
    EXPECT_THAT((std::vector<int>{m1, m2, m3, m4, m5}), ElementsAre(1, 301, 3, 4, 5));

    instrument_->WriteCPLD(0x8001, 0x1234, 3);
    EXPECT_THAT(fake_.cpld, ElementsAre(0x8001, 0x1234, 3));
    instrument_->ReadCPLD(p1);
    EXPECT_EQ(p1, 0x8001);

    fake_.commands.clear();
    instrument_->Reset(0x0102);
    instrument_->DownloadFirmware(0x1234, Bytes(3), false);
    instrument_->DownloadFirmware(0x1234, Bytes(3), true);
    EXPECT_THAT(fake_.commands,
                ElementsAre(Command{"Reset", 0x0102}, Command{"DownloadRAMFirmware", 0x1234, 3},
                            Command{"DownloadEEPROMFirmware", 0x1234, 3}));
}

TEST(PellandoFunctionality, AnEmptyTransportIsRefused) {
    EXPECT_THROW(PellandoFunctionality(SmartPointer<PellandoFunctionalityByte>()), NullPointerException);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
