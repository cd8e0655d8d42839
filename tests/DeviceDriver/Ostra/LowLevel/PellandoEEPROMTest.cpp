#include <gmock/gmock.h>

#include <algorithm>
#include <memory>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEEPROM.h"
#include "FakeCommands.h"
#include "FreshEeprom.h"
#include "ImageCheck.h"
#include "Protocol/ByteOrder.h"
#include "Support/ExpectThrow.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Generic::Configuration;
using namespace Generic::Utilities;
using testing::IsEmpty;
using Tests::ExpectThrow;
using Varnholt::Utilities::Exceptions::ResourceException;
using Longs = std::vector<std::int32_t>;
using Changes = std::vector<std::pair<std::uint16_t, std::int32_t>>;

const std::string LogWrites =
    "write 0+256 write 256+256 write 512+256 write 768+256 write 1024+40 "
    "write 2048+256 write 2304+256 write 2560+256 write 2816+256 write 3072+40";

class EepromTest : public testing::Test {
  protected:
    void Load() {
        eeprom_ = std::make_unique<PellandoEEPROM>(Open(instrument_));
        instrument_.TakeCommands();
    }
    void Store(const Changes& values) {
        set_ = Properties();
        for (const auto& [id, value] : values) {
            set_.SetProperty(id, Property(value));
        }
        eeprom_->Store(set_);
    }
    void ChangeLog(int times) {
        for (int change = 1; change <= times; ++change) {
            eeprom_->SetProperty(10002, Property(change));
        }
    }
    void ExpectLocked() {
        ExpectThrow<ResourceException>("EEPROM already locked", [&] { eeprom_->Lock(); });
    }
    void ExpectCommands(const std::string& commands) { EXPECT_EQ(instrument_.TakeCommands(), commands); }

    FakeInstrument instrument_{.eeprom = Simulator::FreshEeprom()};
    std::unique_ptr<PellandoEEPROM> eeprom_;
    Properties set_;
};

TEST_F(EepromTest, IsReadInTwoHalvesAndThenServedFromMemory) {
    const std::string halves[] = {"read 0+4096", "read 0+4096 read 4096+4096"};
    Protocol::StoreBig32(&instrument_.eeprom[4712], 4711);
    eeprom_ = std::make_unique<PellandoEEPROM>(Open(instrument_));
    ExpectCommands(halves[1]);
    EXPECT_EQ(eeprom_->Load(4000).AsLong(), 4711);
    EXPECT_EQ(eeprom_->Load(10010).AsLongVector(), Longs(128, 0));
    ExpectCommands("");
    for (const std::uint16_t id : std::vector<std::uint16_t>{2009, 11000, 10100, 20001, 20002}) {
        ExpectThrow<ResourceException>("unknown property id = " + std::to_string(id),
                                       [&] { eeprom_->Load(id); });
    }
    eeprom_.reset();
    for (const std::size_t command : {0U, 1U}) {
        const auto commands = Open(instrument_);
        instrument_.failingCommand = command;
        EXPECT_THROW(PellandoEEPROM{commands}, IOException);
        ExpectCommands(halves[command]);
        instrument_.failingCommand = ~std::size_t{0};
    }
    Protocol::StoreBig16(&instrument_.eeprom[4096], 2);
    ExpectThrow<DataException>("corrupt EAT detected!!", [&] { PellandoEEPROM broken(Open(instrument_)); });
    ExpectCommands(halves[1]);
}

TEST_F(EepromTest, LoadFillsSetsByNameOrByIdentifier) {
    Load();
    const std::vector<std::tuple<const char*, std::size_t, std::uint16_t, std::uint16_t>> cases{
        {"CalibrationData", 28, 1000, 3013}, {"LogData", 12, 10000, 10021}, {"EATData", 55, 10000, 2}};
    for (const auto& [name, entries, first, last] : cases) {
        Properties named(name);
        EXPECT_EQ(&eeprom_->Load(named), &named);
        EXPECT_EQ(named.GetName(), first == 1000 ? name : "");
        ASSERT_EQ(named.GetItemCount(), entries) << name;
        EXPECT_EQ(named.GetPropertyKeys().front(), first);
        EXPECT_EQ(named.GetPropertyKeys().back(), last);
    }
    Properties some("CalibrationData");
    some.SetProperty(2005, Property(7));
    some.SetProperty(3009, Property());
    eeprom_->Load(some);
    EXPECT_EQ(some.GetItemCount(), 2U);
    EXPECT_EQ(some.GetProperty(2005).AsLong(), 7);
    EXPECT_EQ(some.GetProperty(3009).AsLongVector(), (Longs{-1, -1}));
    some.SetProperty(20001, Property(1));
    ExpectThrow<ResourceException>("unknown property id = 20001", [&] { eeprom_->Load(some); });
}

TEST_F(EepromTest, StoreObeysItsRequests) {
    // Afterwards 20001 is in the caller's set; -1: it is not.
    Load();
    for (const auto& [name, values, writesLog, writeThroughAfterwards] :
         std::vector<std::tuple<const char*, Changes, bool, std::int32_t>>{
             {"nothing of the EEPROM", {{2005, 1}}, false, -1},
             {"a value", {{1211, 5}}, false, -1},
             {"write through", {{1211, 5}, {20001, 1}}, true, 0},
             {"not quite write through", {{20001, 2}}, false, 2},
             {"dump", {{20002, 1}}, true, -1},
             {"dump wins over write through", {{20001, 1}, {20002, 1}}, true, 1},
         }) {
        SCOPED_TRACE(name);
        Store(values);
        ExpectCommands(writesLog ? LogWrites : "");
        EXPECT_EQ(set_.Contains(20001) ? set_.GetProperty(20001).AsLong() : -1, writeThroughAfterwards);
        ExpectLocked();
    }
    eeprom_->SetProperty(10001, Property(1.0F));
    Store({{10002, 5}, {20002, 1}});
    for (const std::size_t copy : {0U, 2048U}) {
        EXPECT_EQ(Protocol::LoadBig32(&instrument_.eeprom[copy]), 0x3F800005U);
        EXPECT_EQ(Protocol::LoadBig32(&instrument_.eeprom[copy + 8]), 5U);
    }
    EXPECT_EQ(eeprom_->Load(1211).AsLong(), 5);
    EXPECT_EQ(Protocol::LoadBig32(&instrument_.eeprom[4708]), 0xFFFFFFFF)
        << "calibration changes in memory only";
}

TEST_F(EepromTest, LockGuardsWriteThrough) {
    Load();
    instrument_.failingCommand = 0;
    EXPECT_THROW(Store({{20001, 1}}), IOException);
    instrument_.failingCommand = ~std::size_t{0};
    ExpectLocked();
    instrument_.TakeCommands();
    ExpectThrow<ResourceException>("EEPROM access denied", [&] { eeprom_->WriteThrough(); });
    ExpectCommands("");
    eeprom_->Unlock();
    ExpectThrow<ResourceException>("EEPROM already unlocked", [&] { eeprom_->Unlock(); });
    eeprom_->WriteThrough();
    ExpectCommands(LogWrites);
}

TEST_F(EepromTest, BinaryAreasAreWrittenAndReadDirectly) {
    Load();
    const std::string wrongSize = "Wrong Tallimer size", denied = "EEPROM access denied";
    const std::vector<std::tuple<std::uint16_t, std::size_t, std::string, std::string>> cases{
        {10100, 1904,
         "write 1064+256 write 1320+256 write 1576+256 write 1832+216 "
         "write 3112+256 write 3368+256 write 3624+256 write 3880+152",
         ""},
        {10100, 1903, "", wrongSize},
        {10100, 1905, "", wrongSize},
        {10200, 64, "write 4032+64", ""},
        {10200, 65, "", denied},
        {10215, 4, "write 4092+4", ""},
        {10215, 5, "", denied},
        {10216, 0, "", denied},
        {10239, 0, "", denied},
        {10240, 4, "", ""},
        {10199, 4, "", ""}};
    for (const auto& [id, size, writes, refusal] : cases) {
        SCOPED_TRACE(testing::Message() << id << ", " << size << " bytes");
        Bytes data(size);
        std::ranges::generate(data, [byte = std::uint8_t{0}]() mutable { return byte += 7; });
        const auto store = [&, id = id] { eeprom_->StoreBinary(id, data); };
        refusal.empty() ? store() : ExpectThrow<ResourceException>(refusal, store);
        ExpectCommands(writes);
        if (!writes.empty() && size != 64) {
            EXPECT_EQ(eeprom_->LoadBinary(id), data);
            instrument_.TakeCommands();
        }
    }
    EXPECT_EQ(eeprom_->LoadBinary(10216), (Bytes{0, 1, 0x01, 0x4E})) << "the words behind are the table";
    instrument_.missing = 62;
    EXPECT_THAT(eeprom_->LoadBinary(10239), testing::ElementsAre(testing::_, testing::_, 0xAA, 0xAA));
    EXPECT_THAT(eeprom_->LoadBinary(10199), IsEmpty());
    EXPECT_THAT(eeprom_->LoadBinary(10240), IsEmpty());
}

TEST_F(EepromTest, DumpOfAFreshInstrumentIsTheFreshImage) {
    Load();
    EXPECT_EQ(eeprom_->Dump(), Simulator::FreshEeprom());
    ExpectCommands("");
    ChangeLog(20);
    const Bytes image = eeprom_->Dump();
    ExpectCommands(LogWrites);  // which was due
    EXPECT_EQ(Protocol::LoadBig32(&image[2048 + 8]), 20U);
}

TEST(EepromImages, ValuesThatChangedTheirSizeReadBackRight) {
    // In the middle, at the end and at the beginning; shorter, empty and as long as fits; and of the log.
    for (const Resize& resize :
         {Resize{3009, 3}, {1000, 40}, {3011, 0}, {3013, 860}, {10011, 130}, {10021, 2}, {10010, 2}}) {
        EXPECT_TRUE(RoundTrips(Simulator::FreshEeprom(), {resize})) << resize.id;
    }
    EXPECT_FALSE(RoundTrips(Simulator::FreshEeprom(), {{3013, 861}}));
}

/// The binary block lies right behind the log, and the table further on.
TEST_F(EepromTest, LogThatHasGrownBeyondItsAreaIsRefusedAsLongAsItIs) {
    constexpr const char* tooSmall = "Configuration data dump target too small";
    for (const Longs& grown : {Longs{1, 2}, Longs(248, 1), Longs(3000, 1)}) {
        SCOPED_TRACE(grown.size());
        Load();
        eeprom_->SetProperty(10021, Property(grown));
        const bool fitsAnImage = 1060 + 4 * grown.size() <= 2048;
        if (fitsAnImage) {
            EXPECT_NO_THROW(eeprom_->Dump()) << "an image has a table of its own";
            eeprom_->SetProperty(10021, Property(grown));
        }
        ChangeLog(19);
        for (int attempt = 0; attempt < 2; ++attempt) {
            ExpectThrow<ResourceException>(tooSmall, [&] { eeprom_->DumpLog(); });
            ExpectThrow<ResourceException>(tooSmall, [&] { ChangeLog(1); });
            ExpectThrow<ResourceException>(tooSmall, [&] { eeprom_->Dump(); });
        }
        if (fitsAnImage) {
            eeprom_->GetLog().SetItem(10021, Property(1));
        }
        eeprom_.reset();
        ExpectCommands(fitsAnImage ? LogWrites : "");
        instrument_.eeprom = Simulator::FreshEeprom();
    }
    Load();
    eeprom_->SetProperty(10000, Property(Longs{1, 2}));
    EXPECT_NO_THROW(eeprom_->DumpLog()) << "the checksum is one value again by then";
    eeprom_->SetProperty(10012, Property(Longs{}));
    instrument_.TakeCommands();
    eeprom_.reset();
    EXPECT_THAT(instrument_.TakeCommands(), testing::EndsWith(" write 3072+36")) << "as it is";
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
