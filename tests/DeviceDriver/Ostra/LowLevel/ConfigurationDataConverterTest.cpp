#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Generic::Configuration;
using Converter = ConfigurationDataConverter;

/// What the converter says of an identifier: its categories, type and elements of its default.
std::string Description(std::uint16_t id) {
    const std::pair<bool (*)(std::uint16_t), const char*> categories[] = {
        {&Converter::IsCalibrationParameter, "calibration "},
        {&Converter::IsLogParameter, "log "},
        {&Converter::IsSpecialParameter, "special "},
        {&Converter::IsMiscParameter, "misc "},
        {&Converter::IsMeasureParameter, "measure "},
        {&Converter::IsResetParameter, "reset "},
        {&Converter::IsCPLDParameter, "CPLD "},
        {&Converter::IsFirmwareDownloadParameter, "firmware "},
        {&Converter::IsModeDependent, "mode "},
    };
    std::string text;
    for (const auto& [contains, name] : categories) {
        text += contains(id) ? name : "";
    }
    try {
        const Property value = Converter::GetDefaultProperty(id);
        const bool isZero = value.AsByteVector(true) == std::vector<std::uint8_t>(value.SizeOf());
        return text + std::to_string(value.GetType()) + "/" + std::to_string(value.SizeOf() / 4) +
               (isZero ? "" : "!");
    } catch (const Generic::Utilities::DataException& exception) {
        EXPECT_EQ(exception.what(), "invalid property id " + std::to_string(id));
        return text;
    }
}

TEST(ConfigurationDataConverter, KnowsEveryIdentifier) {
    static_assert(TypeLong == 0 && TypeLongVector == 1 && TypeFloat == 2 && TypeFloatVector == 3);
    const std::pair<const char*, std::vector<std::uint16_t>> groups[] = {
        {"calibration 0/1",
         {1204, 1205, 1207, 1208, 1211, 1212, 3001, 3002, 3007, 3008, 3011, 3012, 3013, 4000}},
        {"calibration 1/2", {1002, 1003}},
        {"calibration 2/1", {1213, 1221, 1222, 3014}},
        {"calibration 3/2", {1000, 1001, 1004, 1100, 1101, 1102}},
        {"calibration special 0/1", {3010}},
        {"calibration special 1/2", {3009}},
        {"log 0/1", {10000, 10002, 10003, 10005, 10012, 10020, 10021}},
        {"log 1/128", {10010, 10011}},
        {"log 2/1", {10001, 10004, 10013}},
        {"misc 0/1", {2004, 2006, 2012, 2013, 2020}},
        {"misc 2/1", {2016, 2017}},
        {"measure mode 0/1", {2000, 2002, 2003, 2008, 2010, 2021}},
        {"measure mode 2/1", {2001, 2009}},
        {"mode 0/1", {2011, 2014, 2015}},
        {"reset 0/1", {2007}},
        {"CPLD 0/1", {20000}},
        {"firmware ", {20003}},
        {"0/1", {2005, 20001, 20002}},
    };
    std::map<std::uint16_t, std::string> expected;
    for (const auto& [description, ids] : groups) {
        for (const std::uint16_t id : ids) {
            expected[id] = description;
        }
    }
    for (std::uint32_t id = 0; id <= 0xFFFF; ++id) {
        const auto known = static_cast<std::uint16_t>(id);
        ASSERT_EQ(Description(known), expected[known]) << id;
    }
}

TEST(ConfigurationDataConverter, ConvertsBigEndian) {
    Property entry = Converter::GetDefaultProperty(1000);
    std::vector<std::uint8_t> bytes{0xBF, 0x80, 0, 0, 0x3F, 0x80, 0, 0};
    Converter::ByteArrayToConfigurationDataEntry(bytes, entry);
    EXPECT_EQ(entry.AsFloatVector(), (std::vector<float>{-1.0F, 1.0F}));
    Converter::ConfigurationDataEntryToByteArray(Property(std::int32_t{-2}), bytes);
    EXPECT_EQ(bytes, (std::vector<std::uint8_t>{0xFF, 0xFF, 0xFF, 0xFE}));
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
