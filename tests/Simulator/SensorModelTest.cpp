#include <gtest/gtest.h>

#include <algorithm>
#include <numeric>
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
    return std::accumulate(values.begin() + 1, values.begin() + 127, 0.0) / 126;
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

}  // namespace
}  // namespace Varnholt::Simulator
