#include <algorithm>
#include <cmath>
#include <limits>
#include <sstream>

#include "DeviceDriver/Ostra/LowLevel/PellandoRAM.h"
#include "FakeCommands.h"
#include "Support/ExpectThrow.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using namespace Generic::Configuration;
using Tests::ExpectThrow;
using Varnholt::Utilities::Exceptions::ResourceException;
using Answers = std::array<std::uint8_t, 6>;

constexpr float Infinity = std::numeric_limits<float>::infinity();
constexpr float NotANumber = std::numeric_limits<float>::quiet_NaN();

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

class RamTest : public testing::Test {
  protected:
    RamTest() {
        instrument_.misc2 = 300;
        set_.SetProperty(2013, Property(300));
        set_.SetProperty(2009, Property(0.068F));
        set_.SetProperty(2001, Property(0.0884F));
        set_.SetProperty(2010, Property(100));
        for (const std::uint16_t id : std::vector<std::uint16_t>{2008, 2000, 2002, 2003}) {
            set_.SetProperty(id, Property(0));
        }
    }

    std::string Loaded(std::uint16_t id) {
        Properties set;
        set.SetProperty(id, Property());
        EXPECT_EQ(&ram_.Load(set), &set);
        return Text(set);
    }

    FakeInstrument instrument_;
    PellandoRAM ram_{Open(instrument_)};
    Properties set_ = PellandoRAM::GetDefaultPhysicalConditons();  ///< a whole set for storing
};

TEST_F(RamTest, LoadsMiscValuesAndWhatFollowsFromTheSecond) {
    instrument_.misc1 = 200;
    instrument_.misc3 = 3;
    instrument_.misc4 = 65535;
    instrument_.misc5 = 5;
    for (const int misc2 : {0, 300, 301, 65535}) {
        instrument_.misc2 = static_cast<std::uint16_t>(misc2);
        EXPECT_EQ(Loaded(2013), "2013=" + std::to_string(misc2) + " 2012=200 2004=3 2006=65535 2020=5 " +
                                    (misc2 < 301 ? "2016=0.5 2017=0.012" : "2016=0.25 2017=0.005"));
        EXPECT_EQ(instrument_.TakeCommands(), "GetMISC");
    }
}

TEST_F(RamTest, LoadsMeasurementParametersInSecondsAndFlags) {
    instrument_.p1 = 1000;
    instrument_.p2 = 10;
    instrument_.p3 = 65535;
    instrument_.p5 = 7;
    const std::pair<std::uint8_t, std::string> cases[] = {{0xA1, "2008=1 2000=0 2002=0 2003=0"},
                                                          {0xA2, "2008=0 2000=1 2002=0 2003=0"},
                                                          {0xA4, "2008=0 2000=0 2002=1 2003=0"},
                                                          {0xA8, "2008=0 2000=0 2002=0 2003=1"}};
    for (const auto& [flags, expected] : cases) {
        instrument_.p4 = flags;
        EXPECT_EQ(Loaded(2021), "2021=7 2009=0.068 2001=0.0884 2010=65535 " + expected);
        EXPECT_EQ(instrument_.TakeCommands(), "GetMeasureParameters");
    }
    instrument_.p2 = 65535;
    EXPECT_FLOAT_EQ(ram_.Load(2001).AsFloat(), 579.3294F);
}

TEST_F(RamTest, LoadAsksOnlyForWhatIsWanted) {
    Properties set;
    set.SetProperty(1000, Property(3));
    set.SetProperty(2005, Property(4));
    EXPECT_EQ(Text(ram_.Load(set)), "1000=3 2005=4");
    EXPECT_EQ(ram_.Load(2007).AsLong(), 0);
    EXPECT_EQ(instrument_.TakeCommands(), "");
    Properties some("PhysicalConditions");
    some.SetProperty(2013, Property());
    ram_.Load(some);
    EXPECT_EQ(instrument_.TakeCommands(), "GetMISC");

    Properties conditions("PhysicalConditions");
    EXPECT_EQ(Text(ram_.Load(conditions)),
              "2000=0 2001=0 2002=0 2003=0 2008=0 2009=0 2010=0 2004=0 2005=-1 2006=0 2012=0 2013=300 2020=0 "
              "2011=-1 2014=-1 2015=-1 2016=0.5 2017=0.012 9189=-1 2021=0");
    EXPECT_EQ(instrument_.TakeCommands(), "GetMISC GetMeasureParameters");
    for (const auto& [id, value] : PellandoRAM::GetDefaultPhysicalConditons().GetDatastore()) {
        const bool isFloat = id == 2001 || id == 2009 || id == 2016 || id == 2017;
        EXPECT_EQ(isFloat ? value.AsFloat() : static_cast<float>(value.AsLong()), -1.0F) << id;
    }
}

TEST_F(RamTest, StoresRoundedCountsTheThirdParameterAndFlags) {
    struct Case {
        const char* name;
        std::vector<std::pair<std::uint16_t, Property>> changes;
        const char* stored;  ///< p1 to p4
    };
    const auto times = [](const char* name, float integrationTime, float secondTime, const char* stored) {
        return Case{name, {{2009, Property(integrationTime)}, {2001, Property(secondTime)}}, stored};
    };
    const auto third = [](std::int32_t value, std::int32_t replacement, std::int32_t flag0,
                          const char* stored) {
        return Case{"third parameter",
                    {{2010, Property(value)}, {9189, Property(replacement)}, {2008, Property(flag0)}},
                    stored};
    };
    const Case cases[] = {
        times("rounded up", 0.06804F, 0.0933F, "1001 11 100 0"),
        times("rounded down", 0.06803F, 0.0927F, "1000 10 100 0"),
        times("half a count", 3.5e-5F, 0.00443F, "1 1 100 0"),
        times("longest", 4.45638F, 579.3294F, "65535 65535 100 0"),
        times("16 low bits", 4.456448F, 579.33824F, "0 0 100 0"),
        times("the template's -1", -1.0F, -1.0F, "50831 65424 100 0"),
        times("more than 32 bits", 1e9F, 1e9F, "65535 65535 100 0"),
        times("less than 32 bits", -1e9F, -Infinity, "0 0 100 0"),
        times("no number", NotANumber, NotANumber, "0 0 100 0"),
        third(300, -1, 0, "1000 10 256 0"),
        third(-1, -1, 0, "1000 10 65535 0"),
        third(100, 0, 1, "1000 10 100 1"),
        third(100, 1, 1, "1000 10 1 0"),
        third(100, 300, -7, "1000 10 300 0"),
        third(100, 300, 0, "1000 10 100 0"),
        {"a flag", {{2008, Property(2)}}, "1000 10 100 1"},
        {"a flag", {{2000, Property(2)}}, "1000 10 100 2"},
        {"a flag", {{2002, Property(2)}}, "1000 10 100 4"},
        {"a flag", {{2003, Property(2)}}, "1000 10 100 8"},
    };
    for (const Case& row : cases) {
        Properties set = set_;
        for (const auto& [id, value] : row.changes) {
            set.SetProperty(id, value);
        }
        ram_.Store(set);
        std::ostringstream stored;
        stored << instrument_.p1 << " " << instrument_.p2 << " " << instrument_.p3 << " "
               << int{instrument_.p4};
        EXPECT_EQ(stored.str(), row.stored) << row.name;
        EXPECT_EQ(instrument_.TakeCommands(), "SetMeasureParameters");
    }
}

TEST_F(RamTest, StoreNeedsAWholeSet) {
    ExpectThrow<ResourceException>("id 2013 doesn't exist", [&] { ram_.Store(2009, Property(0.1F)); });
    ram_.Store(2013, Property(1));
    ram_.Store(1211, Property(1));
    EXPECT_EQ(instrument_.TakeCommands(), "");
    set_.SetProperty(2008, Property(1));
    set_.GetDatastore().remove_if([](const auto& entry) { return entry.first == 9189; });
    ram_.Store(set_);
    EXPECT_EQ(instrument_.p4, 1) << "only the replacement may be missing";
}

// What instruments say of their modes: how many, which, nothing, factor, microseconds, perfect or not.

/// The later ones with the finer time base.
Answers Three(std::uint8_t mode) {
    return mode == 1   ? Answers{3, 1, 0, 130, 68, 1}
           : mode == 2 ? Answers{3, 2, 0, 100, 20, 0}
                       : Answers{3, 3, 0, 10, 5, 1};
}
Answers Two(std::uint8_t mode) {
    return mode == 1 ? Answers{2, 1, 0, 13, 19, 1} : Answers{2, 2, 0, 1, 1, 1};
}
/// One of so many modes that is too slow for most times.
Answers Slow(int modes, int mode) {
    return {static_cast<std::uint8_t>(modes), static_cast<std::uint8_t>(mode), 0, 255, 255, 1};
}

class ModeSearch : public RamTest {
  protected:
    ModeSearch() {
        instrument_.misc2 = 301;
        instrument_.describeMode = &Three;
        set_.SetProperty(2013, Property(301));
    }
    void Store(float seconds) {
        set_.SetProperty(2009, Property(seconds));
        ram_.Store(set_);
    }
};

TEST_F(ModeSearch, TakesTheFirstModeThatFitsOrRefusesTheTime) {
    constexpr const char* high = "Integration time too high";
    constexpr const char* low = "Integration time too low";
    const float rounded = 247e-6F;  // a little less; the product of two floats is taken as it is
    const struct {
        const char* name;
        Answers (*describe)(std::uint8_t mode);
        float seconds;
        std::ptrdiff_t tried;
        const char* refusal;
        bool perfect = false;
        std::uint16_t p1 = 0;
    } cases[] = {
        {"shortest of the first", &Three, 8840e-6F, 1, nullptr, true, 130},
        {"too short for the first", &Three, 8839e-6F, 2, nullptr, false, 442},
        {"shortest of the second", &Three, 2000e-6F, 2, nullptr, false, 100},
        {"last mode", &Three, 1999e-6F, 3, nullptr, true, 400},
        {"shortest of all", &Three, 50e-6F, 3, nullptr, true, 10},
        {"longest of all", &Three, 4.456379F, 1, nullptr, true, 65535},
        {"a fraction less", &Two, rounded, 2, nullptr, true, 247},
        {"a fraction more", &Two, std::nextafter(rounded, 1.0F), 1, nullptr, true, 13},
        {"first count that is too much", &Three, 4.45638F, 1, high},
        {"the template's -1", &Three, -1.0F, 1, high},
        {"2^63 us", &Three, 9.223372E12F, 1, high},
        {"too short for the last", &Three, 49e-6F, 3, low},
        {"no number", &Three, NotANumber, 3, low},
        {"never leaves its first mode", [](std::uint8_t) { return Slow(3, 0); }, 1e-3F, 255, low},
        {"255 modes", [](std::uint8_t mode) { return Slow(255, mode); }, 1e-3F, 255, low},
        {"jumps to the last", [](std::uint8_t) { return Slow(9, 9); }, 1e-3F, 1, low},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        instrument_.describeMode = &Three;
        Store(0.068F);
        ASSERT_TRUE(ram_.IsInPerfectMode());
        instrument_.TakeCommands();
        instrument_.describeMode = row.describe;
        if (row.refusal) {
            ExpectThrow<ResourceException>(row.refusal, [&] { Store(row.seconds); });
            EXPECT_EQ(ram_.IsInPerfectMode(), row.refusal == high) << "too high leaves it, too low clears it";
            EXPECT_EQ(instrument_.p1, 1000) << "nothing was stored";
            EXPECT_FLOAT_EQ(ram_.Load(2009).AsFloat(), 0.068F) << "the time base of construction";
        } else {
            Store(row.seconds);
            EXPECT_EQ(ram_.IsInPerfectMode(), row.perfect);
            EXPECT_EQ(instrument_.p1, row.p1);
            EXPECT_NEAR(ram_.Load(2009).AsFloat(), row.seconds, 40e-6) << "the same time base";
        }
        EXPECT_EQ(std::ranges::count(instrument_.commands, "SetMeasureMode"), row.tried);
    }
}

TEST_F(ModeSearch, UsesTheModesFactorForTheSecondTime) {
    set_.SetProperty(2001, Property(0.008F));
    Store(0.003F);
    EXPECT_EQ(instrument_.p2, 4U) << "0.008 s in units of 100 times 20 us";
    EXPECT_FLOAT_EQ(ram_.Load(2001).AsFloat(), 0.008F);
    Store(0.068F);
    EXPECT_TRUE(ram_.IsInPerfectMode());
    set_.SetProperty(2013, Property(300));
    set_.SetProperty(2001, Property(0.0265F));
    Store(0.068F);
    EXPECT_EQ(instrument_.p2, 3U) << "an instrument without modes has the time base of construction";
    EXPECT_FALSE(ram_.IsInPerfectMode());
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
