#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <iostream>
#include <random>
#include <vector>

#include "ImageCheck.h"
#include "Protocol/EepromMap.h"
#include "Protocol/Instrument.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

namespace EepromMap = Protocol::EepromMap;
using Bytes = std::vector<std::uint8_t>;

/// Changes to a fresh image, most of them where it describes itself, and to the sizes of its values.
Bytes RandomRecords(std::uint32_t seed) {
    std::minstd_rand random(seed + 1);
    const auto below = [&random](std::uint32_t limit) {
        return static_cast<std::uint32_t>(random() % limit);
    };
    constexpr std::uint32_t usedTable = 334, placesOfValues = 0xFFFF - Protocol::EepromSize;
    const bool resizes = below(4) == 0;
    Bytes records;
    for (std::uint32_t count = 1 + below(below(8) == 0 ? 64 : 4); count > 0; --count) {
        std::uint32_t place =
            below(4) == 0 ? below(Protocol::EepromSize) : EepromMap::Table + below(usedTable);
        std::uint32_t number = below(2) == 0 ? below(0x10000) : 4 * below(2000);
        if (resizes) {
            place = Protocol::EepromSize + below(placesOfValues);
            number = below(8) == 0 ? below(1000) : below(6);
        }
        records.insert(records.end(),
                       {static_cast<std::uint8_t>(place >> 8), static_cast<std::uint8_t>(place),
                        static_cast<std::uint8_t>(number >> 8), static_cast<std::uint8_t>(number)});
    }
    return records;
}

TEST(MutatedImages, GiveAModelThatRoundTripsOrADocumentedException) {
    const char* const isLong = std::getenv("OSTRA_LONG");
    const std::uint32_t count = OSTRA_MUTATED_IMAGES * (isLong != nullptr && *isLong == '1' ? 10 : 1);
    std::array<std::uint32_t, 4> outcomes{};
    for (std::uint32_t seed = 0; seed < count; ++seed) {
        const Bytes records = RandomRecords(seed);
        try {
            ++outcomes[static_cast<std::size_t>(CheckRecords(records.data(), records.size()))];
        } catch (const std::exception& exception) {
            FAIL() << "seed " << seed << ": " << exception.what();
        }
    }
    std::cout << count << " images: " << outcomes[0] << " refused, " << outcomes[1]
              << " loaded but not to be dumped, " << outcomes[2]
              << " dumped elsewhere than their tables say, " << outcomes[3] << " round trips\n";
    EXPECT_GT(*std::ranges::min_element(outcomes), count / 100) << "the images must reach every outcome";
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
