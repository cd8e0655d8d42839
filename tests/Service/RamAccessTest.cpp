#include <gtest/gtest.h>

#include <algorithm>
#include <optional>
#include <random>
#include <tuple>

#include "FakeCommands.h"
#include "Service/Failure.h"
#include "Service/Memory/RamAccess.h"

namespace Varnholt::Tests {
namespace {

using Service::RamAccess;
using namespace DeviceDriver::Ostra::LowLevel;
using DeviceDriver::Generic::Configuration::Property;

constexpr std::uint32_t LongestCount = 65535;

struct ModeBytes {
    std::uint8_t factor, tick;
};

/// What a store leaves in the instrument.
using State = std::tuple<int, int, int, int, int>;

class RamAccessTest : public testing::Test {
  protected:
    RamAccessTest() {
        instrument_.misc2 = 301;
        instrument_.describeMode = [this](std::uint8_t mode) {
            const ModeBytes& bytes = modes_.at(mode - 1U);
            return std::array<std::uint8_t, 6>{
                static_cast<std::uint8_t>(modes_.size()), mode, 0, bytes.factor, bytes.tick, 0};
        };
    }

    State StateNow() const {
        return {instrument_.mode, instrument_.p1, instrument_.p2, instrument_.p3, instrument_.p4};
    }
    void Put(std::uint8_t mode, std::uint32_t p1) {
        instrument_.mode = mode;
        instrument_.p1 = static_cast<std::uint16_t>(p1);
        instrument_.p2 = static_cast<std::uint16_t>(LongestCount - p1);
        instrument_.p3 = static_cast<std::uint16_t>(p1 % 257);
        instrument_.p4 = static_cast<std::uint8_t>(p1 % 16);
    }
    /// Stores what was just loaded, with an integration time of its own if one is given; false when no mode
    /// takes it.
    bool Store(std::optional<float> seconds) {
        RamAccess ram(commands_);
        auto set = ram.Load();
        if (seconds) {
            set.SetProperty(2009, Property(*seconds));
            set.SetProperty(2001, Property(0.0F));
        }
        try {
            ram.Store(set);
        } catch (const Service::Failure&) {
            return false;
        }
        instrument_.commands.clear();
        return true;
    }
    /// Whether storing what was just loaded changes nothing.
    bool IsKept() {
        const State before = StateNow();
        return Store(std::nullopt) && StateNow() == before;
    }
    std::uint32_t Random() { return static_cast<std::uint32_t>(random_()); }

    std::minstd_rand random_{1};
    FakeInstrument instrument_;
    const RamAccess::Commands commands_ = Open(instrument_);
    std::vector<ModeBytes> modes_;
};

/// The search compares times only with the ends of a mode, so that these are the counts that may get lost.
TEST_F(RamAccessTest, WhatWasLoadedIsKeptAndWhatIsTypedTakenInEveryMode) {
    for (std::uint32_t factor = 1; factor <= 255; ++factor) {
        for (std::uint32_t tick = 1; tick <= 255; ++tick) {
            modes_ = {{static_cast<std::uint8_t>(factor), static_cast<std::uint8_t>(tick)}, {1, 1}};
            const std::uint32_t between = factor + Random() % (LongestCount - factor);
            for (const std::uint32_t count : {factor, between, LongestCount}) {
                Put(1, count);
                ASSERT_TRUE(IsKept()) << count << " in a mode of " << factor << " x " << tick << " us";
            }
            // What is typed means what it says, although its float may lie below it.
            Put(2, 65000);
            ASSERT_TRUE(Store(static_cast<float>(factor * tick * 1e-6)));
            ASSERT_EQ(std::pair(int{instrument_.mode}, std::uint32_t{instrument_.p1}), std::pair(1, factor))
                << factor << " x " << tick;
            ASSERT_FALSE(Store(static_cast<float>((factor * tick - 0.4) * 1e-6)) && instrument_.mode == 1);
        }
    }
}

/// A count may stand for a time that another mode takes, although the time that it was made of did not.
TEST_F(RamAccessTest, WhatWasStoredIsKeptWithAnyNumberOfModes) {
    int stored = 0, roundedIntoAnotherMode = 0;
    modes_.assign(255, {255, 255});
    modes_[253] = {50, 5};
    modes_[254] = {2, 10};
    Put(1, 1000);
    ASSERT_TRUE(Store(0.000247F));
    EXPECT_EQ(std::pair(int{instrument_.mode}, int{instrument_.p1}), std::pair(255, 25));
    EXPECT_TRUE(IsKept());
    modes_ = {{10, 10}, {10, 10}};
    Put(2, 10);
    EXPECT_TRUE(Store(std::nullopt) && instrument_.mode == 1) << "no time leads to the second";

    for (int round = 0; round < 20000; ++round) {
        modes_.resize(1 + Random() % 4);
        for (ModeBytes& mode : modes_) {
            mode = {static_cast<std::uint8_t>(1 + Random() % 255),
                    static_cast<std::uint8_t>(1 + Random() % 255)};
        }
        const ModeBytes& aimedAt = modes_[Random() % modes_.size()];
        const std::uint32_t lowest = std::uint32_t{aimedAt.factor} * aimedAt.tick;
        // Mostly near the end of a mode, where it matters.
        const std::uint32_t microseconds =
            Random() % 4 == 0 ? Random() % 16711425 : lowest + Random() % 600 - std::min(lowest, 300U);
        Put(1, 1000);
        if (Store(static_cast<float>(microseconds * 1e-6))) {
            const std::uint32_t rounded =
                instrument_.p1 * std::uint32_t{modes_.at(instrument_.mode - 1U).tick};
            ++stored;
            roundedIntoAnotherMode +=
                std::any_of(modes_.begin(), modes_.begin() + instrument_.mode - 1,
                            [rounded](const ModeBytes& mode) {
                                return std::uint32_t{mode.factor} * mode.tick <= rounded;
                            })
                    ? 1
                    : 0;
            ASSERT_TRUE(IsKept()) << microseconds << " us, round " << round;
        }
    }
    EXPECT_GT(stored, 5000);
    EXPECT_GT(roundedIntoAnotherMode, 50);
}

}  // namespace
}  // namespace Varnholt::Tests
