#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

#include "FaultPlan.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Simulator {
namespace {

using testing::HasSubstr;

TEST(FaultPlanTest, TextIsReadAndWrittenBack) {
    struct Case {
        std::string text;
        std::string canonical;
    };
    for (const Case& test : {
             Case{"", ""},
             Case{" ; ", ""},
             Case{"3:stall", "3:stall"},
             Case{"  7+ : silent ;bulk-in   2:short = 10;", "7+:silent; bulk-in 2:short=10"},
             Case{"control 0+:late=50;interrupt 1:flip;bulk-out 4294967295:short",
                  "control 0+:late=50; interrupt 1:flip; bulk-out 4294967295:short"},
         }) {
        const FaultPlan plan = FaultPlan::Parse(test.text);
        EXPECT_EQ(test.canonical, plan.Text());
        EXPECT_EQ(plan, FaultPlan::Parse(plan.Text()));
    }
    for (const FaultName& name : AllFaults()) {
        Fault fault;
        fault.kind = name.kind;
        fault.argument = name.argument == FaultName::Argument::None ? std::nullopt : std::optional(12U);
        const FaultPlan plan({fault});
        EXPECT_EQ(plan, FaultPlan::Parse(plan.Text())) << name.name;
    }
}

TEST(FaultPlanTest, MistakesAreExplained) {
    struct Case {
        const char* text;
        const char* explanation;
    };
    for (const Case& test : {
             Case{"stall", "expected INDEX:FAULT"},
             Case{"3:stal", "unknown fault \"stal\"; known: stall, io-error"},
             Case{"3:", "unknown fault \"\""},
             Case{"x:stall", "\"x\" is no transfer index"},
             Case{"-1:stall", "\"-1\" is no transfer index"},
             Case{"4294967296:stall", "is no transfer index"},
             Case{"bulk 3:stall", "unknown transfers \"bulk\"; known: control, bulk-in"},
             Case{"3:late", "needs a number: late=MILLISECONDS"},
             Case{"3:late=soon", "\"soon\" is no number"},
             Case{"3:stall=1", "stall takes no number"},
             Case{"1:stall; 2:oops", "\"2:oops\""},
         }) {
        try {
            FaultPlan::Parse(test.text);
            ADD_FAILURE() << test.text;
        } catch (const std::invalid_argument& error) {
            EXPECT_THAT(error.what(), HasSubstr(test.explanation)) << test.text;
        }
    }
}

TEST(FaultScriptTest, CountsInEachScope) {
    FaultScript script(FaultPlan::Parse("2:stall; bulk-in 1:empty; control 2+:silent; 5:long"));
    constexpr std::uint8_t in = Protocol::BulkInEndpoint;
    constexpr std::uint8_t out = Protocol::BulkOutEndpoint;
    std::string seen;
    for (const std::uint8_t endpoint : std::vector<std::uint8_t>{0, in, out, in, 0, 0, 0}) {
        const auto fault = script.Next(endpoint);
        seen += fault ? ToText(*fault) + "|" : "-|";
    }
    EXPECT_EQ("-|-|2:stall|bulk-in 1:empty|-|control 2+:silent|control 2+:silent|", seen);
    EXPECT_EQ(7U, script.Transfers());
    EXPECT_EQ(4U, script.Hits());
}

}  // namespace
}  // namespace Varnholt::Simulator
