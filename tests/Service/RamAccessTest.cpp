#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <random>
#include <string_view>
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
    /// Stores what was just loaded; false when that changes anything.
    bool IsKept() {
        const State before = StateNow();
        RamAccess ram(commands_);
        try {
            ram.Store(ram.Load());
        } catch (const Service::Failure&) {
            return false;
        }
        instrument_.commands.clear();
        return StateNow() == before;
    }

    FakeInstrument instrument_;
    const RamAccess::Commands commands_ = Open(instrument_);
    std::vector<ModeBytes> modes_;
};

/// The search compares times only with the ends of a mode, so that these are the counts that may get lost.
TEST_F(RamAccessTest, WhatWasLoadedIsKeptAtTheEndsOfEveryMode) {
    auto random = [generator = std::minstd_rand(1)]() mutable {
        return static_cast<std::uint32_t>(generator());
    };
    for (std::uint32_t factor = 1; factor <= 255; ++factor) {
        for (std::uint32_t tick = 1; tick <= 255; ++tick) {
            modes_ = {{static_cast<std::uint8_t>(factor), static_cast<std::uint8_t>(tick)}, {1, 1}};
            const std::uint32_t between = factor + random() % (LongestCount - factor);
            for (const std::uint32_t count : {factor, between, LongestCount}) {
                Put(1, count);
                ASSERT_TRUE(IsKept()) << count << " in a mode of " << factor << " x " << tick << " us";
            }
        }
    }
}

/// Rounding depends on time base and count alone. All 16.7 million of them take half a minute.
TEST_F(RamAccessTest, WhatWasLoadedIsKeptAtEveryCountOfEveryTimeBase) {
    const char* const wish = std::getenv("OSTRA_LONG");
    const std::uint32_t step = wish != nullptr && std::string_view(wish) == "1" ? 1 : 509;
    for (std::uint32_t tick = 1; tick <= 255; ++tick) {
        modes_ = {{1, static_cast<std::uint8_t>(tick)}};
        for (std::uint32_t count = 1 + tick % step; count <= LongestCount; count += step) {
            Put(1, count);
            ASSERT_TRUE(IsKept()) << count << " of " << tick << " us";
        }
    }
}

/// A count may stand for a time that another mode takes, although the time that it was made of did not.
TEST_F(RamAccessTest, WhatWasStoredIsKeptWithAnyNumberOfModes) {
    auto random = [generator = std::minstd_rand(1)]() mutable {
        return static_cast<std::uint32_t>(generator());
    };
    int stored = 0, roundedIntoAnotherMode = 0;
    const auto store = [&](float seconds) {
        RamAccess ram(commands_);
        auto set = ram.Load();
        set.SetProperty(2009, Property(seconds));
        set.SetProperty(2001, Property(0.0F));
        try {
            ram.Store(set);
        } catch (const Service::Failure&) {
            return false;
        }
        const std::uint32_t rounded = instrument_.p1 * std::uint32_t{modes_.at(instrument_.mode - 1U).tick};
        const bool isTakenEarlier = std::any_of(
            modes_.begin(), modes_.begin() + instrument_.mode - 1,
            [rounded](const ModeBytes& mode) { return std::uint32_t{mode.factor} * mode.tick <= rounded; });
        ++stored;
        roundedIntoAnotherMode += isTakenEarlier ? 1 : 0;
        return true;
    };

    modes_ = {{50, 5}, {2, 10}};
    Put(1, 1000);
    ASSERT_TRUE(store(0.000247F));
    EXPECT_EQ(std::pair(int{instrument_.mode}, int{instrument_.p1}), std::pair(2, 25));
    EXPECT_TRUE(IsKept());

    for (int round = 0; round < 20000; ++round) {
        modes_.resize(1 + random() % 4);
        for (ModeBytes& mode : modes_) {
            mode = {static_cast<std::uint8_t>(1 + random() % 255),
                    static_cast<std::uint8_t>(1 + random() % 255)};
        }
        const ModeBytes& aimedAt = modes_[random() % modes_.size()];
        const std::uint32_t lowest = std::uint32_t{aimedAt.factor} * aimedAt.tick;
        // Mostly near the end of a mode, where it matters.
        const std::uint32_t microseconds =
            random() % 4 == 0 ? random() % 16711425 : lowest + random() % 600 - std::min(lowest, 300U);
        Put(1, 1000);
        if (store(static_cast<float>(microseconds * 1e-6))) {
            ASSERT_TRUE(IsKept()) << microseconds << " us, round " << round;
        }
    }
    EXPECT_GT(stored, 5000);
    EXPECT_GT(roundedIntoAnotherMode, 50);
}

/// What is typed means what it says, although its float may lie below it.
TEST_F(RamAccessTest, TypedMicrosecondsAreTakenAsTheyAre) {
    for (std::uint32_t factor = 1; factor <= 255; ++factor) {
        for (std::uint32_t tick = 1; tick <= 255; ++tick) {
            modes_ = {{static_cast<std::uint8_t>(factor), static_cast<std::uint8_t>(tick)}, {1, 1}};
            Put(2, 65000);
            RamAccess ram(commands_);
            auto set = ram.Load();
            set.SetProperty(2001, Property(0.0F));
            set.SetProperty(2009, Property(static_cast<float>(factor * tick * 1e-6)));
            ram.Store(set);
            ASSERT_EQ(std::pair(int{instrument_.mode}, std::uint32_t{instrument_.p1}), std::pair(1, factor))
                << factor << " x " << tick;
            instrument_.commands.clear();
        }
    }
}

}  // namespace
}  // namespace Varnholt::Tests
