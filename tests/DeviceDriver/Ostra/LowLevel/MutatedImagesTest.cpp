#include <gtest/gtest.h>

#include <array>
#include <cstdlib>
#include <iostream>
#include <random>

#include "FakeCommands.h"
#include "ImageCheck.h"
#include "Protocol/EepromMap.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

namespace EepromMap = Protocol::EepromMap;

/// `OSTRA_LONG=1` in the environment asks for ten times as many.
std::uint32_t ImageCount() {
    const char* const wish = std::getenv("OSTRA_LONG");
    return wish != nullptr && wish[0] == '1' ? OSTRA_MUTATED_IMAGES * 10 : OSTRA_MUTATED_IMAGES;
}

/// A fresh image with random bytes changed, most of them where the image describes itself.
Bytes MutatedImage(const Bytes& fresh, std::uint32_t seed) {
    std::minstd_rand random(seed + 1);
    const auto below = [&random](std::uint32_t limit) {
        return static_cast<std::uint32_t>(random() % limit);
    };
    Bytes image = fresh;
    const std::uint32_t changes = 1 + below(below(4) == 0 ? 64 : 4);
    for (std::uint32_t i = 0; i < changes; ++i) {
        const std::uint32_t usedTable = 334;
        const std::uint32_t position =
            below(4) == 0 ? below(Protocol::EepromSize) : EepromMap::Table + below(usedTable);
        // Small steps lead to tables that are nearly right, which random bytes hardly ever are.
        const std::uint32_t value = below(2) == 0 ? below(256) : image[position] + 4 * below(4);
        image[position] = static_cast<std::uint8_t>(value);
    }
    return image;
}

/// How often each outcome came about; ends with the first failure.
template <class Check>
std::array<int, 4> Outcomes(std::uint32_t count, Check check) {
    std::array<int, 4> outcomes{};
    for (std::uint32_t seed = 0; seed < count; ++seed) {
        try {
            ++outcomes[static_cast<std::size_t>(check(seed))];
        } catch (const std::exception& exception) {
            ADD_FAILURE() << "seed " << seed << ": " << exception.what();
            break;
        }
    }
    return outcomes;
}

TEST(MutatedImages, GiveAModelThatRoundTripsOrADocumentedException) {
    const Bytes fresh = FreshImage();
    ASSERT_EQ(CheckImage(fresh), ImageOutcome::RoundTripRight);
    const std::uint32_t count = ImageCount();
    const auto outcomes =
        Outcomes(count, [&](std::uint32_t seed) { return CheckImage(MutatedImage(fresh, seed)); });
    std::cout << count << " images: " << outcomes[0] << " refused, " << outcomes[1]
              << " loaded but not to be dumped, " << outcomes[2]
              << " dumped elsewhere than their tables say, " << outcomes[3] << " round trips\n";
    for (const std::size_t outcome : {0U, 2U, 3U}) {
        EXPECT_GT(outcomes[outcome], static_cast<int>(count / 100)) << "the images must reach every outcome";
    }
}

TEST(MutatedImages, ValuesOfAnySizeRoundTripOrAreRefused) {
    const auto outcomes = Outcomes(ImageCount() / 10, [](std::uint32_t seed) {
        std::minstd_rand random(seed + 1);
        Bytes records;
        for (auto count = random() % 4; count-- > 0;) {
            const auto value = static_cast<std::uint8_t>(random() % 40);
            const auto elements = random() % 8 == 0 ? random() % 1000 : random() % 6;
            // 32 times 256 and more picks a value, not an address.
            records.insert(records.end(),
                           {static_cast<std::uint8_t>(33 + random() % 200), value,
                            static_cast<std::uint8_t>(elements >> 8), static_cast<std::uint8_t>(elements)});
        }
        return CheckRecords(records.data(), records.size());
    });
    EXPECT_EQ(outcomes[0], 0) << "a fresh image can be loaded";
    EXPECT_GT(outcomes[1], 0);
    EXPECT_GT(outcomes[3], outcomes[1]);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
