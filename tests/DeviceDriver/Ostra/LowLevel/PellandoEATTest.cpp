#include <limits>
#include <map>
#include <memory>
#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"
#include "DeviceDriver/Ostra/LowLevel/SectionReader.h"
#include "FreshEeprom.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"
#include "Service/Memory/ImageModel.h"
#include "Support/ExpectThrow.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

namespace EepromMap = Protocol::EepromMap;
using namespace Generic::Configuration;
using Generic::Utilities::DataException;
using Tests::ExpectThrow;
using Varnholt::Utilities::Exceptions::ResourceException;
using Bytes = std::vector<std::uint8_t>;
using Entries = std::vector<std::pair<std::uint16_t, std::int32_t>>;
using Longs = std::vector<std::int32_t>;

constexpr const char* Corrupt = "corrupt EAT detected!!";
constexpr std::int32_t Lowest = std::numeric_limits<std::int32_t>::min();
constexpr std::int32_t Highest = std::numeric_limits<std::int32_t>::max();

Entries EntriesOf(const PellandoEAT& table) {
    Entries entries;
    for (const auto& [id, address] : table.GetDatastore().GetDatastore()) {
        entries.emplace_back(id, address.AsLong());
    }
    return entries;
}

std::unique_ptr<PellandoEAT> TableOf(const Entries& entries) {
    auto table = std::make_unique<PellandoEAT>();
    for (const auto& [id, address] : entries) {
        table->CreateSection({}, static_cast<std::uint32_t>(address), id, 0);
    }
    return table;
}

class FreshTable : public testing::Test {
  protected:
    FreshTable() {
        table_.InitializeEmtpyEAT();
        fresh_ = EntriesOf(table_);
    }
    PellandoEAT table_;
    Entries fresh_;
    const Bytes image_ = Simulator::FreshEeprom();
    PellandoLog log_{PellandoEAT(image_.begin() + EepromMap::Table), image_.begin()};
};

TEST_F(FreshTable, IsTheOneOfAFreshInstrumentByteForByte) {
    EXPECT_EQ(Service::FreshImage(), image_);
    EXPECT_EQ(EntriesOf(PellandoEAT(image_.begin() + EepromMap::Table)), fresh_);
    Bytes bytes(4);
    EXPECT_NO_THROW(PellandoEAT().Dump(bytes.begin(), bytes.end())) << "a header alone";
    ExpectThrow<ResourceException>("Configuration data dump target too small",
                                   [&] { table_.Dump(bytes.begin(), bytes.end() - 1); });
}

TEST_F(FreshTable, SizeIsTheDistanceToTheNextEntry) {
    for (const auto& [id, size] :
         std::map<std::uint16_t, int>{{10010, 512}, {11021, 4}, {3009, 8}, {3013, 4}}) {
        EXPECT_EQ(table_.SizeOf(id), size) << id;
    }
    ExpectThrow<ResourceException>("id 5 doesn't exist", [&] { table_.SizeOf(5); });
    ExpectThrow<ResourceException>("id 5 doesn't exist", [&] { table_.AddressOf(5); });
    ExpectThrow<ResourceException>("id 2 doesn't exist", [&] { table_.SizeOf(2); });  // which is the last
    for (const auto& [known, address, next] :
         {std::tuple{7, 4, 8}, {7, 3, 7}, {7, 3, 8}, {7, 4, 9}, {5, 4, 8}, {8, 0, 4}}) {
        Properties one;
        one.SetProperty(static_cast<std::uint16_t>(known), Property(1));
        const bool isThere = known == 7 && address == 4 && next == 8;
        EXPECT_EQ(TableOf({{7, address}, {8, next}})->Locates(one, 4, 0), isThere) << next;
    }
    EXPECT_EQ(TableOf({{7, 0}, {8, Highest}})->SizeOf(7), Highest);
    EXPECT_EQ(TableOf({{7, 0}, {8, Lowest}})->SizeOf(7), Lowest);
    ExpectThrow<DataException>(Corrupt, [] { TableOf({{7, -1}, {8, Highest}})->SizeOf(7); });
    ExpectThrow<DataException>(Corrupt, [] { TableOf({{7, 1}, {8, Lowest}})->SizeOf(7); });

    EXPECT_TRUE(table_.IsEntryInLogArea(11021, 4095 - 3108));
    EXPECT_FALSE(table_.IsEntryInLogArea(11021, 4096 - 3108));
    EXPECT_FALSE(table_.IsEntryInLogArea(10000, 0xFFFFFFFF));
}

TEST(PellandoEAT, HeaderDecidesWhetherAndHowFarTheTableIsRead) {
    // Without entries the table is refused.
    const std::vector<std::tuple<std::uint16_t, std::uint16_t, std::ptrdiff_t>> cases{
        {0, 334, 0},  {2, 334, 0},  {0x0100, 334, 0}, {1, 299, 0},  {1, 300, 50},
        {1, 304, 50}, {1, 305, 51}, {1, 508, 84},     {1, 512, 84}, {1, 513, 0}};
    Bytes bytes(EepromMap::TableArea, 0xFF);
    Entries many;
    for (std::uint16_t i = 0; i < 84; ++i) {
        many.emplace_back(static_cast<std::uint16_t>(100 + i % 83), i);  // the last one repeats the first
        Protocol::StoreBig16(&bytes[4U + 6 * i], many.back().first);
        Protocol::StoreBig32(&bytes[6U + 6 * i], i);
    }
    for (const auto& [version, length, entries] : cases) {
        SCOPED_TRACE(testing::Message() << "version " << version << ", length " << length);
        Protocol::StoreBig16(&bytes[0], version);
        Protocol::StoreBig16(&bytes[2], length);
        const auto table = TableOf({{101, 77}, {5, 88}});
        if (entries == 0) {
            ExpectThrow<DataException>(Corrupt, [&] { table->ParseBuffer(bytes.data()); });
            ExpectThrow<DataException>(Corrupt, [&] { PellandoEAT{bytes.begin()}; });
            EXPECT_EQ(EntriesOf(*table), (Entries{{101, 77}, {5, 88}}));
        } else {
            // What the table holds keeps its place and gets the last address of its identifier.
            Entries expected{{101, 1}, {5, 88}, {100, entries == 84 ? 83 : 0}};
            expected.insert(expected.end(), many.begin() + 2,
                            many.begin() + std::min<std::ptrdiff_t>(entries, 83));
            table->ParseBuffer(bytes.data());
            EXPECT_EQ(EntriesOf(*table), expected);
        }
    }
}

/// Where things move to otherwise is seen in images that are read back (`EepromImages`).
TEST_F(FreshTable, StaysBehindTheLastValueOfASetAndWhereAChangeFails) {
    Properties longer = PellandoEAT::GetDefaultCalibrationData();
    longer.SetProperty(3013, Property(Longs(3)));
    table_.EnsureConsistency(longer);
    EXPECT_EQ(EntriesOf(table_), fresh_);
    Properties set;
    set.SetProperty(1000, Property(Longs{1, 2, 3}));
    table_.FitSection(set, 0);
    EXPECT_EQ(EntriesOf(table_), fresh_) << "only a section's last value moves its end";
    set.SetProperty(1001, Property(Longs{1, 2, 3}));
    set.SetProperty(77, Property(std::int32_t{1}));
    ExpectThrow<ResourceException>("id 77 doesn't exist", [&] { table_.EnsureConsistency(set); });
    ExpectThrow<ResourceException>("id 77 doesn't exist", [&] { table_.FitSection(set, 0); });
    log_.SetItem(10001, Property(Longs{1, 2}));
    log_.SetItem(10100, Property(std::int32_t{1}));
    ExpectThrow<ResourceException>("id 10100 doesn't exist", [&] { table_.EnsureConsistency(log_); });
    EXPECT_EQ(EntriesOf(table_), fresh_);
    const auto odd = TableOf({{1000, 0}, {1001, 11}, {3, 20}});
    set.GetDatastore().pop_back();
    odd->FitSection(set, 0);
    EXPECT_EQ(EntriesOf(*odd), (Entries{{1000, 0}, {1001, 12}, {3, 24}}));
}

TEST_F(FreshTable, IsFollowedWhereItCanBeUsedAndRefusedWhereNot) {
    constexpr std::size_t refused = ~std::size_t{0};
    // Addresses of 3010 and of the entry behind it, and what is read for 3010.
    const std::vector<std::tuple<const char*, std::int32_t, std::int32_t, std::size_t>> cases{
        {"empty at the end", 8192, 8192, 0},           {"up to the last byte", 8188, 8192, 1},
        {"beyond the last byte", 8188, 8193, refused}, {"behind the image", 8196, 8196, refused},
        {"before the image", -4, 0, refused},          {"backwards", 4744, 4740, refused},
        {"half an element too many", 4740, 4746, 1},
    };
    for (const auto& [name, address, next, elements] : cases) {
        SCOPED_TRACE(name);
        const auto table = TableOf({{3010, address}, {2, next}});
        const SectionReader read(*table, &ConfigurationDataConverter::IsCalibrationParameter);
        if (elements == refused) {
            ExpectThrow<DataException>(Corrupt, [&] { read(image_.data(), 0); });
        } else {
            const Properties section = read(image_.data(), 0);
            EXPECT_EQ(section.GetProperty(3010).AsLongVector().size(), elements);
            EXPECT_EQ(section.GetProperty(3010).GetType(), TypeLong);
        }
    }
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
