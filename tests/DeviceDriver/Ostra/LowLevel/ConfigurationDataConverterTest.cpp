#include <gtest/gtest.h>

#include <map>
#include <set>
#include <string>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "Support/ExpectThrow.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Generic::Configuration;
using Generic::Utilities::DataException;
using Tests::ExpectThrow;
using Varnholt::Utilities::Exceptions::RuntimeException;
using Ids = std::set<int>;

/// Calibration and log parameters show in what the memory model loads.
TEST(ConfigurationDataConverter, OtherCategories) {
    using Converter = ConfigurationDataConverter;
    const struct {
        const char* name;
        bool (*contains)(std::uint16_t);
        Ids ids;
    } categories[] = {
        {"special", &Converter::IsSpecialParameter, {3009, 3010}},
        {"misc", &Converter::IsMiscParameter, {2004, 2006, 2012, 2013, 2016, 2017, 2020}},
        {"measure", &Converter::IsMeasureParameter, {2000, 2001, 2002, 2003, 2008, 2009, 2010, 2021}},
        {"reset", &Converter::IsResetParameter, {2007}},
        {"CPLD", &Converter::IsCPLDParameter, {20000}},
        {"firmware download", &Converter::IsFirmwareDownloadParameter, {20003}},
        {"mode dependent",
         &Converter::IsModeDependent,
         {2000, 2001, 2002, 2003, 2008, 2009, 2010, 2011, 2014, 2015, 2021}},
    };
    for (const auto& category : categories) {
        for (int id = 0; id <= 0xFFFF; ++id) {
            ASSERT_EQ(category.contains(static_cast<std::uint16_t>(id)), category.ids.contains(id))
                << category.name << " " << id;
        }
    }
}

TEST(ConfigurationDataConverter, EveryIdentifierHasItsDefaultOrNone) {
    struct Kind {
        PropertyType type;
        std::size_t elements;
        Ids ids;
    };
    const Kind kinds[] = {
        {TypeFloatVector, 2, {1000, 1001, 1004, 1100, 1101, 1102}},
        {TypeLongVector, 2, {1002, 1003, 3009}},
        {TypeLongVector, 128, {10010, 10011}},
        {TypeFloat, 1, {1213, 1221, 1222, 2001, 2009, 2016, 2017, 3014, 10001, 10004, 10013}},
        {TypeLong, 1, {1204,  1205,  1207,  1208,  1211,  1212,  2000,  2002, 2003, 2004,  2005,
                       2006,  2007,  2008,  2010,  2011,  2012,  2013,  2014, 2015, 2020,  2021,
                       3001,  3002,  3007,  3008,  3010,  3011,  3012,  3013, 4000, 10000, 10002,
                       10003, 10005, 10012, 10020, 10021, 20000, 20001, 20002}},
    };
    std::map<int, const Kind*> expected;
    for (const Kind& kind : kinds) {
        for (const int id : kind.ids) {
            expected[id] = &kind;
        }
    }
    for (int id = 0; id <= 0xFFFF; ++id) {
        SCOPED_TRACE(id);
        if (const auto known = expected.find(id); known != expected.end()) {
            const Property value =
                ConfigurationDataConverter::GetDefaultProperty(static_cast<std::uint16_t>(id));
            ASSERT_EQ(value.GetType(), known->second->type);
            ASSERT_EQ(value.AsByteVector(true), std::vector<std::uint8_t>(4 * known->second->elements, 0));
        } else {
            ExpectThrow<DataException>("invalid property id " + std::to_string(id), [id] {
                ConfigurationDataConverter::GetDefaultProperty(static_cast<std::uint16_t>(id));
            });
        }
    }
}

TEST(ConfigurationDataConverter, ConvertsBigEndianWhatHasAType) {
    using Converter = ConfigurationDataConverter;
    Property entry = Converter::GetDefaultProperty(1000);
    Converter::ByteArrayToConfigurationDataEntry({0xBF, 0x80, 0, 0, 0x3F, 0x80, 0, 0}, entry);
    EXPECT_EQ(entry.AsFloatVector(), (std::vector<float>{-1.0F, 1.0F}));
    std::vector<std::uint8_t> bytes{1, 2, 3};
    for (const auto& [value, last] : {std::pair{-1, 0xFF}, std::pair{-2, 0xFE}}) {
        Converter::ConfigurationDataEntryToByteArray(Property(std::int32_t{value}), bytes);
        EXPECT_EQ(bytes, (std::vector<std::uint8_t>{0xFF, 0xFF, 0xFF, static_cast<std::uint8_t>(last)}));
    }
    Property untyped;
    constexpr const char* refusal = "Invalid configuration data type.";
    ExpectThrow<RuntimeException>(refusal,
                                  [&] { Converter::ByteArrayToConfigurationDataEntry(bytes, untyped); });
    ExpectThrow<RuntimeException>(refusal,
                                  [&] { Converter::ConfigurationDataEntryToByteArray(untyped, bytes); });
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
