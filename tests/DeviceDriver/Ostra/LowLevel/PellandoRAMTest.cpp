#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <limits>
#include <sstream>
#include <string>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoRAM.h"
#include "FakeCommands.h"
#include "Support/ExpectThrow.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Generic::Configuration;
using Generic::Utilities::DataException;
using testing::ElementsAre;
using testing::IsEmpty;
using Tests::ExpectThrow;
using Varnholt::Utilities::Exceptions::ResourceException;
using Answers = std::array<std::uint8_t, 6>;

constexpr float Infinity = std::numeric_limits<float>::infinity();
constexpr float NotANumber = std::numeric_limits<float>::quiet_NaN();

Property Long(std::int32_t value) {
    return Property(value);
}

class RamTest : public testing::Test {
  protected:
    RamTest() {
        instrument_.misc2 = 300;
        instrument_.describeMode = [](std::uint8_t mode) { return Answers{3, mode, 0, 130, 68, 1}; };
        instrument_.commands.clear();
    }

    /// A whole set for storing.
    static Properties Conditions() {
        Properties set = PellandoRAM::GetDefaultPhysicalConditons();
        set.SetProperty(2013, Long(300));
        set.SetProperty(2009, Property(0.068F));
        set.SetProperty(2001, Property(0.0884F));
        set.SetProperty(2010, Long(100));
        for (const std::uint16_t id : std::vector<std::uint16_t>{2008, 2000, 2002, 2003}) {
            set.SetProperty(id, Long(0));
        }
        return set;
    }
    std::vector<std::string> CommandNames() {
        std::vector<std::string> names;
        for (const Command& command : instrument_.TakeCommands()) {
            names.push_back(command.name);
        }
        return names;
    }

    FakeInstrument instrument_;
    PellandoRAM ram_{Open(instrument_)};
};

/// The entries in their order: "2013=300 2016=0.5".
std::string Text(const Properties& set) {
    std::ostringstream text;
    for (const auto& [id, value] : set.GetDatastore()) {
        text << (text.tellp() == 0 ? "" : " ") << id << "=";
        if (value.GetType() == TypeFloat) {
            text << value.AsFloat();
        } else {
            text << value.AsLong();
        }
    }
    return text.str();
}

TEST_F(RamTest, LoadsMiscValuesAndWhatFollowsFromTheSecond) {
    instrument_.misc1 = 200;
    instrument_.misc3 = 3;
    instrument_.misc4 = 65535;
    instrument_.misc5 = 5;
    for (const int misc2 : {0, 300, 301, 65535}) {
        instrument_.misc2 = static_cast<std::uint16_t>(misc2);
        Properties set;
        set.SetProperty(2013, Property());
        EXPECT_EQ(&ram_.Load(set), &set);
        EXPECT_THAT(CommandNames(), ElementsAre("GetMISC"));
        EXPECT_EQ(Text(set), "2013=" + std::to_string(misc2) + " 2012=200 2004=3 2006=65535 2020=5 " +
                                 (misc2 < 301 ? "2016=0.5 2017=0.012" : "2016=0.25 2017=0.005"));
    }
}

TEST_F(RamTest, LoadsMeasurementParametersInSecondsAndFlags) {
    instrument_.p1 = 1000;
    instrument_.p2 = 10;
    instrument_.p3 = 65535;
    instrument_.p5 = 7;
    const std::pair<int, const char*> cases[] = {
        {0xA0, "2008=0 2000=0 2002=0 2003=0"}, {0xA1, "2008=1 2000=0 2002=0 2003=0"},
        {0xA2, "2008=0 2000=1 2002=0 2003=0"}, {0xA4, "2008=0 2000=0 2002=1 2003=0"},
        {0xA8, "2008=0 2000=0 2002=0 2003=1"}, {0x0F, "2008=1 2000=1 2002=1 2003=1"}};
    for (const auto& [flags, expected] : cases) {
        instrument_.p4 = static_cast<std::uint8_t>(flags);
        Properties set;
        set.SetProperty(2021, Property());
        ram_.Load(set);
        EXPECT_THAT(CommandNames(), ElementsAre("GetMeasureParameters"));
        EXPECT_EQ(Text(set), std::string("2021=7 2009=0.068 2001=0.0884 2010=65535 ") + expected);
    }
    instrument_.p2 = 65535;
    EXPECT_FLOAT_EQ(ram_.Load(2001).AsFloat(), 579.3294F);
}

TEST_F(RamTest, LoadAsksOnlyForWhatIsWanted) {
    Properties set;
    set.SetProperty(1000, Long(3));
    set.SetProperty(2005, Long(4));
    ram_.Load(set);
    EXPECT_EQ(set.GetItemCount(), 2U);
    EXPECT_EQ(ram_.Load(2007).AsLong(), 0);
    Properties empty;
    ram_.Load(empty);
    EXPECT_THAT(instrument_.TakeCommands(), IsEmpty());
    Properties some("PhysicalConditions");
    some.SetProperty(2013, Property());
    ram_.Load(some);
    EXPECT_THAT(CommandNames(), ElementsAre("GetMISC"));

    Properties conditions("PhysicalConditions");
    ram_.Load(conditions);
    EXPECT_THAT(CommandNames(), ElementsAre("GetMISC", "GetMeasureParameters"));
    EXPECT_EQ(Text(conditions),
              "2000=0 2001=0 2002=0 2003=0 2008=0 2009=0 2010=0 2004=0 2005=-1 2006=0 2012=0 2013=300 2020=0 "
              "2011=-1 2014=-1 2015=-1 2016=0.5 2017=0.012 9189=-1 2021=0");
    ExpectThrow<DataException>("invalid property id 9189", [&] { ram_.Load(9189); });
}

TEST_F(RamTest, TemplateHoldsItsIdentifiersInOrder) {
    const Properties& conditions = PellandoRAM::GetDefaultPhysicalConditons();
    EXPECT_EQ(conditions.GetName(), "PhysicalConditions");
    EXPECT_EQ(
        Text(conditions),
        "2000=-1 2001=-1 2002=-1 2003=-1 2008=-1 2009=-1 2010=-1 2004=-1 2005=-1 2006=-1 2012=-1 2013=-1 "
        "2020=-1 2011=-1 2014=-1 2015=-1 2016=-1 2017=-1 9189=-1");
    for (const std::uint16_t id : std::vector<std::uint16_t>{2001, 2009, 2016, 2017}) {
        EXPECT_EQ(conditions.GetProperty(id).GetType(), TypeFloat) << id;
    }
}

TEST_F(RamTest, StoresTimesAsRoundedCounts) {
    struct Case {
        const char* name;
        float integrationTime;
        std::uint16_t p1;
        float secondTime;
        std::uint16_t p2;
    };
    for (const Case& row : {
             Case{"whole counts", 0.068F, 1000, 0.0884F, 10},
             Case{"rounded up", 0.06804F, 1001, 0.0933F, 11},
             Case{"rounded down", 0.06803F, 1000, 0.0927F, 10},
             Case{"nothing", 0, 0, 0, 0},
             Case{"half a count", 3.5e-5F, 1, 0.00443F, 1},
             Case{"longest", 4.45638F, 65535, 579.3294F, 65535},
             Case{"16 low bits", 4.456448F, 0, 579.33824F, 0},
             Case{"the template's -1", -1.0F, 50831, -1.0F, 65424},
             Case{"more than 32 bits", 1e9F, 0xFFFF, 1e9F, 0xFFFF},
             Case{"less than 32 bits", -1e9F, 0, -1e9F, 0},
             Case{"endless", Infinity, 0xFFFF, Infinity, 0xFFFF},
             Case{"endless, backwards", -Infinity, 0, -Infinity, 0},
             Case{"no number", NotANumber, 0, NotANumber, 0},
         }) {
        Properties set = Conditions();
        set.SetProperty(2009, Property(row.integrationTime));
        set.SetProperty(2001, Property(row.secondTime));
        ram_.Store(set);
        EXPECT_THAT(CommandNames(), ElementsAre("SetMeasureParameters"));
        EXPECT_EQ(instrument_.p1, row.p1) << row.name;
        EXPECT_EQ(instrument_.p2, row.p2) << row.name;
    }
}

TEST_F(RamTest, StoresThirdParameterAndFlags) {
    struct Case {
        std::int32_t third;
        std::int32_t replacement;  ///< 0: not in the set
        std::int32_t flag0;
        std::uint16_t p3;
        std::uint8_t flags;
    };
    for (const Case& row : {
             Case{255, -1, 0, 255, 0},
             Case{256, -1, 0, 256, 0},
             Case{300, -1, 0, 256, 0},
             Case{-1, -1, 0, 65535, 0},
             Case{100, -1, 1, 100, 1},
             Case{100, 0, 1, 100, 1},
             Case{100, 1, 1, 1, 0},
             Case{100, 300, 1, 300, 0},
             Case{100, 300, -7, 300, 0},
             Case{100, 65537, 1, 1, 0},
             Case{100, 300, 0, 100, 0},
         }) {
        SCOPED_TRACE(testing::Message() << row.third << " " << row.replacement << " " << row.flag0);
        Properties set = Conditions();
        set.SetProperty(2010, Long(row.third));
        set.SetProperty(2008, Long(row.flag0));
        if (row.replacement == 0) {
            set.GetDatastore().remove_if([](const auto& entry) { return entry.first == 9189; });
        } else {
            set.SetProperty(9189, Long(row.replacement));
        }
        ram_.Store(set);
        EXPECT_EQ(instrument_.p3, row.p3);
        EXPECT_EQ(instrument_.p4, row.flags);
    }
    const std::pair<std::uint16_t, std::uint8_t> flags[] = {{2008, 1}, {2000, 2}, {2002, 4}, {2003, 8}};
    for (const auto& [id, bit] : flags) {
        Properties set = Conditions();
        set.SetProperty(id, Long(2));
        ram_.Store(set);
        EXPECT_EQ(instrument_.p4, bit) << id;
    }
}

TEST_F(RamTest, StoreNeedsAWholeSet) {
    for (const std::uint16_t id :
         std::vector<std::uint16_t>{2013, 2009, 2001, 2010, 2008, 2000, 2002, 2003}) {
        Properties set = Conditions();
        set.GetDatastore().remove_if([id](const auto& entry) { return entry.first == id; });
        ExpectThrow<ResourceException>("id " + std::to_string(id) + " doesn't exist",
                                       [&] { ram_.Store(set); });
    }
    ExpectThrow<ResourceException>("id 2013 doesn't exist", [&] { ram_.Store(2009, Property(0.1F)); });
    ram_.Store(2013, Long(1));
    ram_.Store(1211, Long(1));
    EXPECT_THAT(instrument_.TakeCommands(), IsEmpty());
}

/// Three modes, the later ones with the finer time base.
Answers ThreeModes(std::uint8_t mode) {
    switch (mode) {
        case 1:
            return {3, 1, 0, 130, 68, 1};
        case 2:
            return {3, 2, 0, 100, 20, 0};
        default:
            return {3, 3, 0, 10, 5, 1};
    }
}

class ModeSearch : public RamTest {
  protected:
    ModeSearch() {
        instrument_.misc2 = 301;
        instrument_.describeMode = &ThreeModes;
        set_.SetProperty(2013, Long(301));
    }
    void Want(double microseconds) {
        set_.SetProperty(2009, Property(static_cast<float>(microseconds / 1e6)));
    }
    std::vector<std::uint32_t> TriedModes() {
        std::vector<std::uint32_t> modes;
        for (const Command& command : instrument_.TakeCommands()) {
            if (command.name == "SetMeasureMode") {
                modes.push_back(command.address);
            }
        }
        return modes;
    }

    Properties set_ = Conditions();
};

TEST_F(ModeSearch, TakesTheFirstModeThatFits) {
    struct Case {
        const char* name;
        double microseconds;
        std::vector<std::uint32_t> tried;
        bool perfect;
        std::uint16_t p1;
    };
    for (const Case& row : {
             Case{"first mode", 68000, {1}, true, 1000},
             Case{"shortest of the first", 8840, {1}, true, 130},
             Case{"too short for the first", 8839, {1, 2}, false, 442},
             Case{"shortest of the second", 2000, {1, 2}, false, 100},
             Case{"last mode", 1999, {1, 2, 3}, true, 400},
             Case{"shortest of all", 50, {1, 2, 3}, true, 10},
             Case{"longest of all", 4456379, {1}, true, 65535},
         }) {
        SCOPED_TRACE(row.name);
        Want(row.microseconds);
        ram_.Store(set_);
        EXPECT_EQ(TriedModes(), row.tried);
        EXPECT_EQ(ram_.IsInPerfectMode(), row.perfect);
        EXPECT_EQ(instrument_.p1, row.p1);
        EXPECT_NEAR(ram_.Load(2009).AsFloat(), row.microseconds / 1e6, 40e-6)
            << "loads with the same time base";
        instrument_.TakeCommands();
    }
}

TEST_F(ModeSearch, TakesTheProductOfTwoFloatsAsItIs) {
    instrument_.describeMode = [](std::uint8_t mode) {
        return mode == 1 ? Answers{2, 1, 0, 13, 19, 1} : Answers{2, 2, 0, 1, 1, 1};
    };
    Want(247);
    ram_.Store(set_);
    EXPECT_THAT(TriedModes(), ElementsAre(1, 2)) << "247 us as a float are less, and no fraction counts";
    set_.SetProperty(2009, Property(std::nextafter(set_.GetProperty(2009).AsFloat(), 1.0F)));
    ram_.Store(set_);
    EXPECT_THAT(TriedModes(), ElementsAre(1));
}

TEST_F(ModeSearch, UsesTheModesFactorForTheSecondTime) {
    Want(3000);
    set_.SetProperty(2001, Property(0.008F));
    ram_.Store(set_);
    EXPECT_EQ(instrument_.p2, 4U) << "0.008 s in units of 100 times 20 us";
    EXPECT_FLOAT_EQ(ram_.Load(2001).AsFloat(), 0.008F);
    set_.SetProperty(2013, Long(300));
    set_.SetProperty(2001, Property(0.0265F));
    ram_.Store(set_);
    EXPECT_EQ(instrument_.p2, 3U) << "an instrument without modes has the time base of construction";
    Want(68000);
    for (const int misc2 : {301, 300}) {
        set_.SetProperty(2013, Long(misc2));
        ram_.Store(set_);
        EXPECT_EQ(ram_.IsInPerfectMode(), misc2 == 301);
    }
}

TEST_F(ModeSearch, RefusesTimesThatNoModeCanCount) {
    struct Case {
        const char* name;
        float seconds;
        const char* message;
        std::size_t rounds;
    };
    constexpr const char* high = "Integration time too high";
    constexpr const char* low = "Integration time too low";
    for (const Case& row : {
             Case{"first count that is too much", 4.45638F, high, 1},
             Case{"the template's -1", -1.0F, high, 1},
             Case{"too short for the last", 49e-6F, low, 3},
             Case{"nothing", 0, low, 3},
             Case{"endless", Infinity, high, 1},
             Case{"no number", NotANumber, low, 3},
         }) {
        SCOPED_TRACE(row.name);
        Want(68000);
        ram_.Store(set_);
        ASSERT_TRUE(ram_.IsInPerfectMode());
        instrument_.TakeCommands();
        set_.SetProperty(2009, Property(row.seconds));
        ExpectThrow<ResourceException>(row.message, [&] { ram_.Store(set_); });
        EXPECT_EQ(ram_.IsInPerfectMode(), row.message == high) << "too high leaves it, too low clears it";
        const auto names = CommandNames();
        EXPECT_EQ(names.size(), 2 * row.rounds);
        EXPECT_THAT(names, testing::Not(testing::Contains("SetMeasureParameters")));
        instrument_.p1 = 1000;
        EXPECT_FLOAT_EQ(ram_.Load(2009).AsFloat(), 0.068F) << "the time base of construction";
        instrument_.TakeCommands();
    }
}

/// One of so many modes that is too slow for most times.
Answers Slow(int modes, int mode) {
    return {static_cast<std::uint8_t>(modes), static_cast<std::uint8_t>(mode), 0, 255, 255, 1};
}

TEST_F(ModeSearch, EndsWithEveryInstrument) {
    struct Case {
        const char* name;
        Answers (*describe)(int mode);
        std::size_t rounds;
    };
    for (const Case& row : {
             Case{"never leaves its first mode", [](int) { return Slow(3, 0); }, 255},
             Case{"goes back and forth", [](int mode) { return Slow(255, mode ^ 1); }, 255},
             Case{"255 modes", [](int mode) { return Slow(255, mode); }, 255},
             Case{"jumps to the last", [](int) { return Slow(9, 9); }, 1},
             Case{"no modes", [](int mode) { return Slow(0, mode); }, 1},
         }) {
        Want(1000);
        instrument_.describeMode = row.describe;
        SCOPED_TRACE(row.name);
        ExpectThrow<ResourceException>("Integration time too low", [&] { ram_.Store(set_); });
        EXPECT_EQ(TriedModes().size(), row.rounds);
    }
    // A time base of nothing, and a factor of nothing.
    instrument_.describeMode = [](std::uint8_t mode) { return Answers{3, mode, 0, 130, 0, 1}; };
    ExpectThrow<ResourceException>("Integration time too high", [&] { ram_.Store(set_); });
    instrument_.describeMode = [](std::uint8_t mode) { return Answers{3, mode, 0, 0, 68, 1}; };
    ram_.Store(set_);
    EXPECT_EQ(instrument_.p2, 0xFFFF);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
