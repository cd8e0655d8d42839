#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"

#include <algorithm>
#include <array>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using namespace Generic::Configuration;

namespace {

using enum ConfigurationDataConverter::Category;

struct Identifier {
    std::uint16_t id;
    unsigned categories;
    PropertyType type;        ///< `TypeNone`: no default
    std::uint16_t count = 1;  ///< elements of the default; only a vector has more
};

constexpr std::array Identifiers{
    Identifier{1000, Calibration, TypeFloatVector, 2},
    Identifier{1001, Calibration, TypeFloatVector, 2},
    Identifier{1002, Calibration, TypeLongVector, 2},
    Identifier{1003, Calibration, TypeLongVector, 2},
    Identifier{1004, Calibration, TypeFloatVector, 2},
    Identifier{1100, Calibration, TypeFloatVector, 2},
    Identifier{1101, Calibration, TypeFloatVector, 2},
    Identifier{1102, Calibration, TypeFloatVector, 2},
    Identifier{1204, Calibration, TypeLong},
    Identifier{1205, Calibration, TypeLong},
    Identifier{1207, Calibration, TypeLong},
    Identifier{1208, Calibration, TypeLong},
    Identifier{1211, Calibration, TypeLong},
    Identifier{1212, Calibration, TypeLong},
    Identifier{1213, Calibration, TypeFloat},
    Identifier{1221, Calibration, TypeFloat},
    Identifier{1222, Calibration, TypeFloat},
    Identifier{2000, Measure | ModeDependent, TypeLong},
    Identifier{2001, Measure | ModeDependent, TypeFloat},
    Identifier{2002, Measure | ModeDependent, TypeLong},
    Identifier{2003, Measure | ModeDependent, TypeLong},
    Identifier{2004, Misc, TypeLong},
    Identifier{2005, None, TypeLong},
    Identifier{2006, Misc, TypeLong},
    Identifier{2007, Reset, TypeLong},
    Identifier{2008, Measure | ModeDependent, TypeLong},
    Identifier{2009, Measure | ModeDependent, TypeFloat},
    Identifier{2010, Measure | ModeDependent, TypeLong},
    Identifier{2011, ModeDependent, TypeLong},
    Identifier{2012, Misc, TypeLong},
    Identifier{2013, Misc, TypeLong},
    Identifier{2014, ModeDependent, TypeLong},
    Identifier{2015, ModeDependent, TypeLong},
    Identifier{2016, Misc, TypeFloat},
    Identifier{2017, Misc, TypeFloat},
    Identifier{2020, Misc, TypeLong},
    Identifier{2021, Measure | ModeDependent, TypeLong},
    Identifier{3001, Calibration, TypeLong},
    Identifier{3002, Calibration, TypeLong},
    Identifier{3007, Calibration, TypeLong},
    Identifier{3008, Calibration, TypeLong},
    Identifier{3009, Calibration | Special, TypeLongVector, 2},
    Identifier{3010, Calibration | Special, TypeLong},
    Identifier{3011, Calibration, TypeLong},
    Identifier{3012, Calibration, TypeLong},
    Identifier{3013, Calibration, TypeLong},
    Identifier{3014, Calibration, TypeFloat},
    Identifier{4000, Calibration, TypeLong},
    Identifier{10000, Log, TypeLong},
    Identifier{10001, Log, TypeFloat},
    Identifier{10002, Log, TypeLong},
    Identifier{10003, Log, TypeLong},
    Identifier{10004, Log, TypeFloat},
    Identifier{10005, Log, TypeLong},
    Identifier{10010, Log, TypeLongVector, 128},
    Identifier{10011, Log, TypeLongVector, 128},
    Identifier{10012, Log, TypeLong},
    Identifier{10013, Log, TypeFloat},
    Identifier{10020, Log, TypeLong},
    Identifier{10021, Log, TypeLong},
    Identifier{20000, Cpld, TypeLong},
    Identifier{20001, None, TypeLong},
    Identifier{20002, None, TypeLong},
    Identifier{20003, FirmwareDownload, TypeNone, 0},
};
static_assert(std::ranges::is_sorted(Identifiers, {}, &Identifier::id));

const Identifier* Find(std::uint16_t id) {
    const auto* const found = std::ranges::lower_bound(Identifiers, id, {}, &Identifier::id);
    return found != Identifiers.end() && found->id == id ? found : nullptr;
}

}  // namespace

bool ConfigurationDataConverter::Belongs(std::uint16_t id, Category category) {
    const Identifier* const known = Find(id);
    return known && (known->categories & category) != 0;
}

Property ConfigurationDataConverter::GetDefaultProperty(std::uint16_t id) try {
    if (const Identifier* const known = Find(id)) {
        switch (known->type) {
            case TypeLong:
                return Property(std::int32_t{0});
            case TypeLongVector:
                return Property(std::vector<std::int32_t>(known->count));
            case TypeFloat:
                return Property(0.0F);
            case TypeFloatVector:
                return Property(std::vector<float>(known->count));
            case TypeNone:
                break;
        }
    }
    throw DataException("invalid property id " + std::to_string(id), Here());
}
TRACED

void ConfigurationDataConverter::ByteArrayToConfigurationDataEntry(const std::vector<std::uint8_t>& bytes,
                                                                   Property& entry) try {
    entry.Assign(bytes, true);
}
TRACED

void ConfigurationDataConverter::ConfigurationDataEntryToByteArray(const Property& entry,
                                                                   std::vector<std::uint8_t>& bytes) try {
    bytes = entry.AsByteVector(true);
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
