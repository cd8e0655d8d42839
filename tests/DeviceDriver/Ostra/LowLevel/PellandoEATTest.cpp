#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>
#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"
#include "DeviceDriver/Ostra/LowLevel/SectionReader.h"
#include "FakeCommands.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"
#include "Support/ExpectThrow.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

namespace EepromMap = Protocol::EepromMap;
using namespace Generic::Configuration;
using Generic::Utilities::DataException;
using Tests::ExpectThrow;
using Varnholt::Utilities::Exceptions::ResourceException;
using Varnholt::Utilities::Exceptions::TraceableException;
using Entries = std::vector<std::pair<std::uint16_t, std::int32_t>>;
using Longs = std::vector<std::int32_t>;

constexpr const char* Corrupt = "corrupt EAT detected!!";

/// The 55 entries of a fresh instrument.
const Entries Fresh{
    {10000, 0},    {10001, 4},    {10002, 8},    {10003, 12},   {10004, 16},   {10005, 20},   {10010, 24},
    {10011, 536},  {10012, 1048}, {10013, 1052}, {10020, 1056}, {10021, 1060}, {1, 1064},     {11000, 2048},
    {11001, 2052}, {11002, 2056}, {11003, 2060}, {11004, 2064}, {11005, 2068}, {11010, 2072}, {11011, 2584},
    {11012, 3096}, {11013, 3100}, {11020, 3104}, {11021, 3108}, {3, 3112},     {1000, 4608},  {1001, 4616},
    {1002, 4624},  {1003, 4632},  {1004, 4640},  {3001, 4648},  {1100, 4652},  {1101, 4660},  {3002, 4668},
    {1102, 4672},  {1221, 4680},  {1222, 4684},  {1204, 4688},  {1205, 4692},  {1207, 4696},  {1208, 4700},
    {1213, 4704},  {1211, 4708},  {4000, 4712},  {1212, 4716},  {3007, 4720},  {3014, 4724},  {3008, 4728},
    {3009, 4732},  {3010, 4740},  {3011, 4744},  {3012, 4748},  {3013, 4752},  {2, 4756}};

Bytes TableBytes(std::uint16_t version, std::uint16_t length, const Entries& entries) {
    Bytes bytes(EepromMap::TableArea, 0xFF);
    Protocol::StoreBig16(&bytes[0], version);
    Protocol::StoreBig16(&bytes[2], length);
    std::size_t offset = 4;
    for (const auto& [id, address] : entries) {
        Protocol::StoreBig16(&bytes[offset], id);
        Protocol::StoreBig32(&bytes[offset + 2], static_cast<std::uint32_t>(address));
        offset += 6;
    }
    return bytes;
}

Entries EntriesOf(const PellandoEAT& table) {
    Entries entries;
    for (const auto& [id, address] : table.GetDatastore().GetDatastore()) {
        entries.emplace_back(id, address.AsLong());
    }
    return entries;
}

class FreshTable : public testing::Test {
  protected:
    FreshTable() { table_.InitializeEmtpyEAT(); }
    PellandoEAT table_;
};

TEST_F(FreshTable, IsTheOneOfAFreshInstrumentByteForByte) {
    EXPECT_EQ(EntriesOf(table_), Fresh);
    Bytes dumped(EepromMap::TableArea, 0xFF);
    table_.Dump(dumped.begin(), dumped.end());
    EXPECT_EQ(dumped, TableBytes(1, 334, Fresh));
    EXPECT_EQ(EntriesOf(PellandoEAT(dumped.begin())), Fresh);
}

TEST_F(FreshTable, SizeIsTheDistanceToTheNextEntry) {
    const std::pair<std::uint16_t, std::int32_t> sizes[] = {{10010, 512}, {11021, 4}, {3009, 8}, {3013, 4}};
    for (const auto& [id, size] : sizes) {
        EXPECT_EQ(table_.SizeOf(id), size) << id;
    }
    ExpectThrow<ResourceException>("id 5 doesn't exist", [&] { table_.SizeOf(5); });
    ExpectThrow<ResourceException>("id 5 doesn't exist", [&] { table_.AddressOf(5); });
    // Nothing says where the last entry ends.
    ExpectThrow<ResourceException>("id 2 doesn't exist", [&] { table_.SizeOf(2); });

    EXPECT_TRUE(table_.IsEntryInLogArea(11021, 4095 - 3108));
    EXPECT_FALSE(table_.IsEntryInLogArea(11021, 4096 - 3108));
    EXPECT_FALSE(table_.IsEntryInLogArea(10000, 0xFFFFFFFF));
    table_.GetDatastore().GetProperty(10000).Assign(std::int32_t{-8});
    EXPECT_TRUE(table_.IsEntryInLogArea(10000, 4103)) << "the sum alone decides";
    EXPECT_FALSE(table_.IsEntryInLogArea(10000, 4104));
}

TEST(PellandoEAT, HeaderDecidesWhetherAndHowFarTheTableIsRead) {
    struct Case {
        std::uint16_t version, length;
        std::size_t entries;  ///< 0: refused
    };
    Entries many;
    for (std::uint16_t i = 0; i < 84; ++i) {
        many.emplace_back(static_cast<std::uint16_t>(100 + i), i);
    }
    for (const Case& row :
         {Case{1, 334, 55}, Case{0, 334, 0}, Case{2, 334, 0}, Case{0x0100, 334, 0}, Case{1, 0, 0},
          Case{1, 299, 0}, Case{1, 300, 50}, Case{1, 304, 50}, Case{1, 305, 51}, Case{1, 508, 84},
          Case{1, 511, 84}, Case{1, 512, 84}, Case{1, 513, 0}, Case{1, 0xFFFF, 0}}) {
        SCOPED_TRACE(testing::Message() << "version " << row.version << ", length " << row.length);
        const Bytes bytes = TableBytes(row.version, row.length, many);
        PellandoEAT table;
        table.CreateSection({}, 77, 100, 0);
        table.CreateSection({}, 88, 5, 0);
        if (row.entries == 0) {
            ExpectThrow<DataException>(Corrupt, [&] { table.ParseBuffer(bytes.data()); });
            ExpectThrow<DataException>(Corrupt, [&] { PellandoEAT{bytes.begin()}; });
            EXPECT_EQ(EntriesOf(table), (Entries{{100, 77}, {5, 88}}));
        } else {
            // What the table holds keeps its place; 100, the first of the entries, gets its address.
            Entries expected{{100, 0}, {5, 88}};
            expected.insert(expected.end(), many.begin() + 1,
                            many.begin() + static_cast<std::ptrdiff_t>(row.entries));
            table.ParseBuffer(bytes.data());
            EXPECT_EQ(EntriesOf(table), expected);
        }
    }
}

/// The entries whose addresses differ from those of a fresh table, with the difference.
std::map<int, int> MovedEntries(const PellandoEAT& table) {
    std::map<int, int> moved;
    const Entries now = EntriesOf(table);
    for (std::size_t i = 0; i < Fresh.size(); ++i) {
        EXPECT_EQ(now[i].first, Fresh[i].first) << "the order must stay";
        if (now[i].second != Fresh[i].second) {
            moved[now[i].first] = now[i].second - Fresh[i].second;
        }
    }
    return moved;
}

/// Where things move to in other cases is seen in images that are read back (`EepromImages`).
TEST_F(FreshTable, EnsureConsistencyMovesTheSetAndFitSectionItsEnd) {
    Properties set = PellandoEAT::GetDefaultCalibrationData();
    set.SetProperty(3009, Property(Longs(3)));
    std::map<int, int> moved{{3010, 4}, {3011, 4}, {3012, 4}, {3013, 4}};
    table_.EnsureConsistency(set);
    EXPECT_EQ(MovedEntries(table_), moved);
    table_.FitSection(set, 0);
    moved[2] = 4;
    EXPECT_EQ(MovedEntries(table_), moved);
    table_.EnsureConsistency(set);
    EXPECT_EQ(MovedEntries(table_), moved) << "a second call must find nothing to do";
    table_.FitSection(PellandoEAT::GetDefaultCalibrationData(), 0);
    EXPECT_EQ(EntriesOf(table_), Fresh) << "and the way back must be open";
}

TEST_F(FreshTable, CopiesOfTheLogMoveEachForItself) {
    const Bytes image = FreshImage();
    PellandoLog log(table_, image.begin());
    log.SetItem(10012, Property(Longs{1, 2, 3}));
    std::map<int, int> moved{{10013, 8}, {10020, 8}, {10021, 8}};
    table_.EnsureConsistency(log);
    EXPECT_EQ(MovedEntries(table_), moved);
    table_.FitSection(log.GetItems(), 0);
    table_.FitSection(log.GetItems(), 1000);
    moved.insert({{1, 8}, {11013, 8}, {11020, 8}, {11021, 8}, {3, 8}});
    EXPECT_EQ(MovedEntries(table_), moved);
}

TEST_F(FreshTable, EnsureConsistencyThatFailsChangesNothing) {
    Properties set;
    set.SetProperty(1000, Property(Longs{1, 2, 3}));
    set.SetProperty(1001, Property(Longs{1, 2, 3}));
    set.SetProperty(77, Property(std::int32_t{1}));
    ExpectThrow<ResourceException>("id 77 doesn't exist", [&] { table_.EnsureConsistency(set); });
    EXPECT_EQ(EntriesOf(table_), Fresh);
    ExpectThrow<ResourceException>("id 77 doesn't exist", [&] { table_.FitSection(set, 0); });
    EXPECT_EQ(EntriesOf(table_), Fresh);

    const Bytes image = FreshImage();
    PellandoLog log(table_, image.begin());
    log.SetItem(10001, Property(Longs{1, 2}));
    log.SetItem(10100, Property(std::int32_t{1}));
    ExpectThrow<ResourceException>("id 10100 doesn't exist", [&] { table_.EnsureConsistency(log); });
    EXPECT_EQ(EntriesOf(table_), Fresh);
}

TEST(PellandoEAT, RepeatedIdentifierKeepsItsPlaceAndTakesTheLastAddress) {
    Entries entries = Fresh;
    entries[20] = {10001, -7};
    const Bytes bytes = TableBytes(1, 334, entries);
    const PellandoEAT table(bytes.begin());
    EXPECT_EQ(table.GetDatastore().GetItemCount(), 54U);
    EXPECT_EQ(EntriesOf(table)[1], (Entries::value_type{10001, -7}));
}

TEST(SectionReader, FollowsTheTableWhereItCanBeUsedAndRefusesItWhereNot) {
    struct Case {
        const char* name;
        std::int32_t address, next;  ///< of 3010 and of the entry behind it
        std::size_t elements;        ///< read for 3010; ~0: refused
    };
    constexpr std::size_t refused = ~std::size_t{0};
    constexpr std::int32_t lowest = std::numeric_limits<std::int32_t>::min();
    constexpr std::int32_t highest = std::numeric_limits<std::int32_t>::max();
    for (const Case& row : {
             Case{"as usual", 4740, 4744, 1},
             Case{"elsewhere", 0, 4, 1},
             Case{"longer than usual", 4740, 4752, 3},
             Case{"empty", 4740, 4740, 0},
             Case{"empty at the end", 8192, 8192, 0},
             Case{"up to the last byte", 8188, 8192, 1},
             Case{"whole image", 0, 8192, 2048},
             Case{"beyond the last byte", 8188, 8196, refused},
             Case{"across the end", 8190, 8194, refused},
             Case{"behind the image", 8193, 8197, refused},
             Case{"before the image", -4, 0, refused},
             Case{"backwards", 4744, 4740, refused},
             Case{"no whole element", 4740, 4743, 0},
             Case{"half an element too many", 4740, 4746, 1},
             Case{"half an element too many, at the end", 8182, 8192, 2},
             Case{"far behind", highest, highest, refused},
             Case{"far before", lowest, lowest, refused},
             Case{"farthest apart", lowest, highest, refused},
             Case{"farthest apart backwards", highest, lowest, refused},
             Case{"size that wraps to a plausible one", lowest, lowest + 4, refused},
         }) {
        SCOPED_TRACE(row.name);
        PellandoEAT table;
        table.CreateSection({}, static_cast<std::uint32_t>(row.address), 3010, 0);
        table.CreateSection({}, static_cast<std::uint32_t>(row.next), 2, 0);
        const Bytes image = FreshImage();
        const SectionReader read(table, &ConfigurationDataConverter::IsCalibrationParameter);
        if (row.elements == refused) {
            ExpectThrow<DataException>(Corrupt, [&] {
                try {
                    read(image.data(), 0);
                } catch (const TraceableException& exception) {
                    EXPECT_THAT(
                        exception.GetTrace().front(),
                        testing::ContainsRegex("LowLevel::(SectionReader::operator|PellandoEAT::SizeOf)"));
                    throw;
                }
            });
        } else {
            const Properties section = read(image.data(), 0);
            EXPECT_EQ(section.GetProperty(3010).AsLongVector().size(), row.elements);
            EXPECT_EQ(section.GetProperty(3010).GetType(), TypeLong);
        }
    }
}

TEST(SectionReader, RefusesWhatTheTableDoesNotSay) {
    const Bytes image = FreshImage();
    PellandoEAT lastHasNoEnd;
    lastHasNoEnd.CreateSection({}, 4608, 3010, 0);
    const SectionReader readCalibration(lastHasNoEnd, &ConfigurationDataConverter::IsCalibrationParameter);
    ExpectThrow<ResourceException>("id 3010 doesn't exist", [&] { readCalibration(image.data(), 0); });

    PellandoEAT withAnUnknown;
    withAnUnknown.CreateSection({}, 4608, 1206, 0);
    withAnUnknown.CreateSection({}, 4612, 2, 0);
    const SectionReader readAll(withAnUnknown, [](std::uint16_t id) { return id > 2; });
    ExpectThrow<DataException>("invalid property id 1206", [&] { readAll(image.data(), 0); });

    PellandoEAT withoutCopy;
    withoutCopy.CreateSection(PellandoEAT::GetDefaultLogData(), 0, 1, 0);
    const SectionReader readLog(withoutCopy, &ConfigurationDataConverter::IsLogParameter);
    EXPECT_EQ(readLog(image.data(), 0).GetItemCount(), 12U);
    ExpectThrow<ResourceException>("id 11000 doesn't exist", [&] { readLog(image.data(), 1000); });
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
