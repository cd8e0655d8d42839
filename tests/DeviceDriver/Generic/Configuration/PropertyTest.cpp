#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <bit>
#include <limits>

#include "DeviceDriver/Generic/Configuration/Property.h"
#include "Support/ExpectThrow.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::DeviceDriver::Generic::Configuration {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using Tests::ExpectThrow;
using Varnholt::Utilities::Exceptions::RuntimeException;
using Bytes = std::vector<std::uint8_t>;
using Longs = std::vector<std::int32_t>;
using Floats = std::vector<float>;

constexpr const char* InvalidType = "Invalid configuration data type.";

struct Case {
    const char* name;
    Property value;
    PropertyType type;
    Longs longs;
    Floats floats;
    Bytes bigEndian;
};

const std::vector<Case>& Cases() {
    static const std::vector<Case> cases{
        {"nothing", Property(), TypeNone, {}, {}, {}},
        {"8 bits extended", Property(std::int8_t{-3}), TypeLong, {-3}, {}, {0xFF, 0xFF, 0xFF, 0xFD}},
        {"16 bits extended", Property(std::int16_t{-2}), TypeLong, {-2}, {}, {0xFF, 0xFF, 0xFF, 0xFE}},
        {"32 bits", Property(std::int32_t{0x01020304}), TypeLong, {0x01020304}, {}, {1, 2, 3, 4}},
        {"float", Property(1.0F), TypeFloat, {}, {1.0F}, {0x3F, 0x80, 0, 0}},
        {"integers", Property(Longs{1, -1}), TypeLongVector, {1, -1}, {}, {0, 0, 0, 1, 255, 255, 255, 255}},
        {"floats", Property(Floats{-2.0F}), TypeFloatVector, {}, {-2.0F}, {0xC0, 0, 0, 0}},
        {"no integers", Property(Longs{}), TypeLongVector, {}, {}, {}},
    };
    return cases;
}

void ExpectHolds(const Property& value, const Case& expected) {
    EXPECT_EQ(value.GetType(), expected.type);
    EXPECT_EQ(value.AsLongVector(), expected.longs);
    EXPECT_EQ(value.AsFloatVector(), expected.floats);
    EXPECT_EQ(value.SizeOf(), expected.bigEndian.size());
}

TEST(Property, ConstructionFixesTypeAndBytes) {
    for (const Case& row : Cases()) {
        SCOPED_TRACE(row.name);
        ExpectHolds(row.value, row);
        if (row.type != TypeNone) {
            EXPECT_EQ(row.value.AsByteVector(true), row.bigEndian);
        }
    }
}

TEST(Property, AssigningReplacesTypeAndValueWhateverWasThere) {
    for (const Case& before : Cases()) {
        SCOPED_TRACE(before.name);
        const auto expect = [&](std::size_t row, const auto& assigned) {
            Property value = before.value;
            ExpectHolds(value.Assign(assigned), Cases()[row]);
        };
        expect(1, std::int8_t{-3});
        expect(2, std::int16_t{-2});
        expect(3, std::int32_t{0x01020304});
        expect(4, 1.0F);
        expect(5, Longs{1, -1});
        expect(6, Floats{-2.0F});
    }
}

TEST(Property, BytesRefillTheValueAndKeepTheType) {
    const Bytes ten{0, 0, 0, 1, 0x80, 0, 0, 0, 9, 9};
    Property longs(Longs{5});
    EXPECT_THAT(longs.Assign(ten, true).AsLongVector(),
                ElementsAre(1, std::numeric_limits<std::int32_t>::min()));
    EXPECT_EQ(longs.GetType(), TypeLongVector);
    EXPECT_THAT(longs.Assign(ten, false).AsLongVector(), ElementsAre(0x01000000, 0x00000080));

    Property single(std::int32_t{7});
    EXPECT_THAT(single.Assign(ten, true).AsLongVector(), testing::SizeIs(2));
    EXPECT_EQ(single.GetType(), TypeLong);
    EXPECT_EQ(single.SizeOf(), 8U);

    const Bytes one{0x3F, 0x80, 0, 0};
    Property real(0.0F);
    EXPECT_EQ(real.Assign(one, true).AsFloat(), 1.0F);
    EXPECT_EQ(std::bit_cast<std::uint32_t>(real.Assign(one, false).AsFloat()), 0x0000803FU);
    EXPECT_EQ(real.GetType(), TypeFloat);

    EXPECT_THAT(real.Assign(Bytes{1, 2, 3}, true).AsFloatVector(), IsEmpty());
    EXPECT_EQ(real.SizeOf(), 0U);
}

TEST(Property, WithoutATypeOrAnElementNothingIsRead) {
    Property none;
    const Property noIntegers((Longs()));
    const Property noFloats((Floats()));
    ExpectThrow<RuntimeException>(InvalidType, [&] { none.Assign(Bytes(4), true); });
    ExpectThrow<RuntimeException>(InvalidType, [&] { none.AsByteVector(true); });
    ExpectThrow<RuntimeException>(InvalidType, [&] { noIntegers.AsLong(); });
    ExpectThrow<RuntimeException>(InvalidType, [&] { Property(1.0F).AsLong(); });
    ExpectThrow<RuntimeException>(InvalidType, [&] { noFloats.AsFloat(); });
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Generic::Configuration
