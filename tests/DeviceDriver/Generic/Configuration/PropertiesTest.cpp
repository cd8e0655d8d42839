#include <gmock/gmock.h>

#include <functional>

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "DeviceDriver/Generic/Utilities/EndianConversion.h"
#include "Support/ExpectThrow.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::DeviceDriver::Generic::Configuration {
namespace {

using testing::ElementsAre;
using Tests::ExpectThrow;
using namespace Varnholt::Utilities::Exceptions;
using Bytes = std::vector<std::uint8_t>;
using Longs = std::vector<std::int32_t>;
using Floats = std::vector<float>;

constexpr const char* InvalidType = "Invalid configuration data type.";

/// Made of `value`, and given it in the place of another of any type.
template <class Value>
void ExpectHeld(const char* name, Value value, PropertyType type, const Longs& longs, const Floats& floats,
                const Bytes& bigEndian) {
    for (Property given : {Property(value), Property(7), Property(1.5F), Property(Longs{1, 2}),
                           Property(Floats{1.5F, 2.5F}), Property()}) {
        SCOPED_TRACE(std::string(name) + " over type " + std::to_string(given.GetType()));
        for (const Property& held : {Property(value), given.Assign(value)}) {
            EXPECT_EQ(held.GetType(), type);
            EXPECT_EQ(held.AsLongVector(), longs);
            EXPECT_EQ(held.AsFloatVector(), floats);
            EXPECT_EQ(held.SizeOf(), bigEndian.size());
            EXPECT_EQ(held.AsByteVector(true), bigEndian);
        }
    }
}

TEST(Property, HoldsWhatItWasGivenWhateverWasThere) {
    ExpectHeld("8 bits extended", std::int8_t{-3}, TypeLong, {-3}, {}, {0xFF, 0xFF, 0xFF, 0xFD});
    ExpectHeld("16 bits extended", std::int16_t{-2}, TypeLong, {-2}, {}, {0xFF, 0xFF, 0xFF, 0xFE});
    ExpectHeld("32 bits", std::int32_t{0x01020304}, TypeLong, {0x01020304}, {}, {1, 2, 3, 4});
    ExpectHeld("float", 1.0F, TypeFloat, {}, {1.0F}, {0x3F, 0x80, 0, 0});
    ExpectHeld("integers", Longs{1, -1}, TypeLongVector, {1, -1}, {}, {0, 0, 0, 1, 255, 255, 255, 255});
    ExpectHeld("floats", Floats{-2.0F}, TypeFloatVector, {}, {-2.0F}, {0xC0, 0, 0, 0});
    ExpectHeld("no integers", Longs{}, TypeLongVector, {}, {}, {});
}

TEST(EndianConversion, TakesSignedShorts) {
    Bytes bytes(2);
    Utilities::EndianConversion::ShortToByteArray(std::int16_t{-2}, bytes.data(), true);
    EXPECT_EQ(bytes, (Bytes{0xFF, 0xFE}));
    std::int16_t value = 0;
    Utilities::EndianConversion::ByteArrayToShort(bytes.data(), value, true);
    EXPECT_EQ(value, -2);
}

TEST(Property, BytesRefillTheValueAndKeepTheType) {
    const Bytes ten{0x3F, 0x80, 0, 0, 0x80, 0, 0, 1, 9, 9};
    for (Property longs : {Property(Longs{5}), Property(std::int32_t{7})}) {
        const PropertyType type = longs.GetType();
        EXPECT_THAT(longs.Assign(ten, true).AsLongVector(), ElementsAre(0x3F800000, -0x7FFFFFFF));
        EXPECT_THAT(longs.Assign(ten, false).AsLongVector(), ElementsAre(0x0000803F, 0x01000080));
        EXPECT_EQ(longs.AsByteVector(false), Bytes(ten.begin(), ten.begin() + 8));
        EXPECT_EQ(longs.GetType(), type);
        EXPECT_EQ(longs.Assign(Bytes{1, 2, 3}, true).SizeOf(), 0U);
    }
    Property real(0.0F);
    EXPECT_EQ(real.Assign(Bytes{0, 0, 0x80, 0x3F}, false).AsFloat(), 1.0F);
    EXPECT_THAT(real.Assign(ten, true).AsFloatVector(), ElementsAre(1.0F, testing::Lt(0)));
    EXPECT_EQ(real.GetType(), TypeFloat);
}

TEST(Property, WithoutATypeOrAnElementNothingIsRead) {
    Property none;
    EXPECT_EQ(none.SizeOf(), 0U);
    const std::function<void()> reads[] = {[&] { none.Assign(Bytes(4), true); },
                                           [&] { none.AsByteVector(true); },
                                           [] { static_cast<void>(Property(Longs()).AsLong()); },
                                           [] { static_cast<void>(Property(1.0F).AsLong()); },
                                           [] { static_cast<void>(Property(Floats()).AsFloat()); }};
    for (const auto& read : reads) {
        ExpectThrow<RuntimeException>(InvalidType, read);
    }
}

TEST(Properties, KeepTheOrderInWhichIdentifiersWereFirstStored) {
    Properties set("Some");
    const Properties& readOnly = set;
    for (const std::uint16_t id : std::vector<std::uint16_t>{30, 10, 20, 10, 65535}) {
        set.SetProperty(id, Property(std::int32_t{id}));
    }
    set.SetProperty(10, Property(1.5F));
    EXPECT_THAT(set.GetPropertyKeys(), ElementsAre(30, 10, 20, 65535));
    EXPECT_EQ(readOnly.GetProperty(10).GetType(), TypeFloat);
    EXPECT_EQ(set.GetName(), "Some");
    EXPECT_TRUE(set.Contains(65535));
    EXPECT_FALSE(set.Contains(5));
    ExpectThrow<ResourceException>("id 5 doesn't exist", [&] { set.GetProperty(5); });
    ExpectThrow<ResourceException>("id 65534 doesn't exist", [&] { readOnly.GetProperty(65534); });
    EXPECT_EQ(Properties::GetExceptionText(1234), "Requested data is not available (ID 1234)");
}

TEST(Properties, DumpIsAStreamOfValuesWithOrWithoutIdentifiers) {
    Properties set;
    set.SetProperty(258, Property(std::int32_t{1}));
    set.SetProperty(3, Property(Floats{1.0F, -1.0F}));
    const std::vector<std::tuple<bool, bool, Bytes>> cases{
        {false, true, {1, 2, 0, 0, 0, 1, 0, 3, 0x3F, 0x80, 0, 0, 0xBF, 0x80, 0, 0}},
        {true, true, {0, 0, 0, 1, 0x3F, 0x80, 0, 0, 0xBF, 0x80, 0, 0}},
        {false, false, {2, 1, 1, 0, 0, 0, 3, 0, 0, 0, 0x80, 0x3F, 0, 0, 0x80, 0xBF}}};
    for (const auto& [valuesOnly, bigEndian, expected] : cases) {
        const auto dump = [&](std::size_t room) {
            Bytes bytes(room, 0xAA);
            set.Dump(bytes.begin(), bytes.end(), valuesOnly, bigEndian);
            return bytes;
        };
        const std::size_t size = expected.size();
        EXPECT_EQ(dump(size), expected);
        EXPECT_EQ(dump(size + 1)[size], 0xAA);
        ExpectThrow<ResourceException>("Configuration data dump target too small", [&] { dump(size - 1); });
    }
    set.SetProperty(2, Property());
    Bytes bytes(18);
    ExpectThrow<RuntimeException>(InvalidType, [&] { set.Dump(bytes.begin(), bytes.end(), false, true); });
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Generic::Configuration
