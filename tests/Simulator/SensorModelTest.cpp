#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "Protocol/ByteOrder.h"
#include "SensorModel.h"

namespace Varnholt::Simulator {
namespace {

std::vector<std::uint16_t> Readings(const SensorModel& sensor, Exposure exposure,
                                    std::uint64_t measurement = 0, std::uint32_t record = 0) {
    std::array<std::uint8_t, Protocol::ReadoutBytes> bytes{};
    sensor.Read(exposure, measurement, record, bytes);
    std::vector<std::uint16_t> values;
    for (std::size_t i = 0; i < bytes.size(); i += 2) {
        values.push_back(Protocol::LoadBig16(&bytes[i]));
    }
    return values;
}

/// Of the pixels that see light.
double Mean(const std::vector<std::uint16_t>& values) {
    double sum = 0;
    for (std::size_t i = 1; i < 127; ++i) {
        sum += values[i];
    }
    return sum / 126;
}

TEST(SensorModelTest, MoreLightOrTimeGivesMoreUntilItSaturates) {
    const SensorModel lamp(1, 1.0, 1.0);
    const auto normal = Readings(lamp, {20000});
    EXPECT_NEAR(2.0, Mean(Readings(lamp, {40000})) / Mean(normal), 0.2);
    EXPECT_NEAR(2.0, Mean(Readings(SensorModel(1, 2.0, 1.0), {20000})) / Mean(normal), 0.2);
    EXPECT_NEAR(0.5, Mean(Readings(SensorModel(1, 1.0, 0.5), {20000})) / Mean(normal), 0.05);
    for (const std::uint64_t longExposure : {std::uint64_t{10'000'000}, ~std::uint64_t{0}}) {
        const auto saturated = Readings(lamp, {longExposure});
        EXPECT_EQ(60000, *std::max_element(saturated.begin() + 1, saturated.begin() + 127));
    }
    EXPECT_LT(normal[0], 200) << "a covered pixel";
}

TEST(SensorModelTest, NoiseIsSeededAndAveragesOut) {
    const SensorModel dark(1, 0.0, 1.0);
    EXPECT_EQ(Readings(dark, {20000}, 3, 4), Readings(dark, {20000}, 3, 4));
    EXPECT_NE(Readings(dark, {20000}, 3, 4), Readings(dark, {20000}, 4, 4));
    EXPECT_NE(Readings(dark, {20000}, 3, 4), Readings(SensorModel(2, 0.0, 1.0), {20000}, 3, 4));

    const auto spread = [&](std::uint32_t averages) {
        double squares = 0;
        int negative = 0;
        for (std::uint32_t record = 0; record < 20; ++record) {
            const auto values = Readings(dark, {20000, averages}, 0, record);
            for (std::size_t i = 1; i < 127; ++i) {
                const int value = static_cast<std::int16_t>(values[i]);
                squares += (value - 11) * (value - 11);
                negative += value < 0 ? 1 : 0;
            }
        }
        EXPECT_EQ(averages == 1, negative > 0);
        return squares / (20 * 126);
    };
    EXPECT_NEAR(36.0, spread(1), 8);
    EXPECT_LT(spread(256), 3);
}

}  // namespace
}  // namespace Varnholt::Simulator
