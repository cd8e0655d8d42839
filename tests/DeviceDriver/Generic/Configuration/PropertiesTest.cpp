#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "Support/ExpectThrow.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::DeviceDriver::Generic::Configuration {
namespace {

using testing::ElementsAre;
using Tests::ExpectThrow;
using Varnholt::Utilities::Exceptions::ResourceException;
using Varnholt::Utilities::Exceptions::RuntimeException;
using Bytes = std::vector<std::uint8_t>;

Property Long(std::int32_t value) {
    return Property(value);
}

TEST(Properties, KeepTheOrderInWhichIdentifiersWereFirstStored) {
    Properties set("Some");
    for (const std::uint16_t id : std::vector<std::uint16_t>{30, 10, 20, 10, 65535}) {
        set.SetProperty(id, Long(id));
    }
    set.SetProperty(10, Property(1.5F));
    EXPECT_THAT(set.GetPropertyKeys(), ElementsAre(30, 10, 20, 65535));
    EXPECT_EQ(set.GetItemCount(), 4U);
    EXPECT_EQ(set.GetProperty(10).GetType(), TypeFloat);
    EXPECT_EQ(set.GetName(), "Some");
    EXPECT_TRUE(set.Contains(65535));
    EXPECT_FALSE(set.Contains(5));
}

TEST(Properties, RefuseAnAbsentIdentifierByItsNumber) {
    Properties set;
    const Properties& readOnly = set;
    ExpectThrow<ResourceException>("id 5 doesn't exist", [&] { set.GetProperty(5); });
    ExpectThrow<ResourceException>("id 65535 doesn't exist", [&] { readOnly.GetProperty(65535); });
    EXPECT_EQ(Properties::GetExceptionText(1234), "Requested data is not available (ID 1234)");
}

TEST(Properties, DumpIsAStreamOfValuesWithOrWithoutIdentifiers) {
    Properties set;
    set.SetProperty(258, Long(1));
    set.SetProperty(3, Property(std::vector<float>{1.0F, -1.0F, 0.0F}));
    const Bytes withIdentifiers{1, 2, 0,    0,    0, 1,  // 258
                                0, 3, 0x3F, 0x80, 0, 0, 0xBF, 0x80, 0, 0, 0, 0, 0, 0};
    const Bytes valuesOnly{0, 0, 0, 1, 0x3F, 0x80, 0, 0, 0xBF, 0x80, 0, 0, 0, 0, 0, 0};
    const Bytes littleEndian{2, 1, 1, 0, 0,    0,  //
                             3, 0, 0, 0, 0x80, 0x3F, 0, 0, 0x80, 0xBF, 0, 0, 0, 0};
    struct Case {
        bool valuesOnly;
        bool bigEndian;
        Bytes expected;
    };
    for (const Case& row : {Case{false, true, withIdentifiers}, Case{true, true, valuesOnly},
                            Case{false, false, littleEndian}}) {
        ASSERT_EQ(set.SizeOf(row.valuesOnly), row.expected.size());
        Bytes exact(row.expected.size());
        set.Dump(exact.begin(), exact.end(), row.valuesOnly, row.bigEndian);
        EXPECT_EQ(exact, row.expected);

        Bytes longer(row.expected.size() + 2, 0xAA);
        set.Dump(longer.begin(), longer.end(), row.valuesOnly, row.bigEndian);
        EXPECT_EQ(longer[row.expected.size()], 0xAA);

        Bytes shorter(row.expected.size() - 1, 0xAA);
        ExpectThrow<ResourceException>("Configuration data dump target too small", [&] {
            set.Dump(shorter.begin(), shorter.end(), row.valuesOnly, row.bigEndian);
        });
        EXPECT_EQ(shorter, Bytes(row.expected.size() - 1, 0xAA)) << "nothing may be written";
    }
}

TEST(Properties, DumpStopsAtAnEntryWithoutAType) {
    Properties set;
    set.SetProperty(1, Long(7));
    set.SetProperty(2, Property());
    Bytes bytes(16, 0xAA);
    ExpectThrow<RuntimeException>("Invalid configuration data type.",
                                  [&] { set.Dump(bytes.begin(), bytes.end(), false, true); });
    EXPECT_EQ(Bytes(bytes.begin(), bytes.begin() + 6), (Bytes{0, 1, 0, 0, 0, 7}));
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Generic::Configuration
