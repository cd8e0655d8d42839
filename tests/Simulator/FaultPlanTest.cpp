#include <gmock/gmock.h>

#include <stdexcept>
#include <utility>
#include <vector>

#include "FaultPlan.h"
#include "Support/FaultText.h"

namespace Varnholt::Simulator {
namespace {

TEST(FaultPlanTest, TextIsRead) {
    std::string all;
    for (const FaultName& name : AllFaults()) {
        const bool hasNumber = name.argument != FaultName::Argument::None;
        all += (all.empty() ? "3:" : "; 3:") + std::string(name.name) + (hasNumber ? "=12" : "");
    }
    for (const auto& [text, canonical] : std::vector<std::pair<std::string, std::string>>{
             {"", ""},
             {" ; ", ""},
             {all, all},
             {"  7+ : silent ;bulk-in   2:short = 10;", "7+:silent; bulk-in 2:short=10"},
             {"control 0+:late=50;interrupt 1:flip;bulk-out 4294967295:short",
              "control 0+:late=50; interrupt 1:flip; bulk-out 4294967295:short"},
         }) {
        const FaultPlan plan = FaultPlan::Parse(text);
        std::string read;
        for (const Fault& fault : plan.Faults()) {
            read += (read.empty() ? "" : "; ") + Tests::FaultText(fault);
        }
        EXPECT_EQ(canonical, read);
    }
}

TEST(FaultPlanTest, MistakesAreExplained) {
    for (const auto& [text, explanation] : std::vector<std::pair<const char*, const char*>>{
             {"stall", "expected INDEX:FAULT"},
             {"3:stal", "unknown fault \"stal\"; known: stall, io-error"},
             {"x:stall", "\"x\" is no transfer index"},
             {"4294967296:stall", "is no transfer index"},
             {"bulk 3:stall", "unknown transfers \"bulk\"; known: control, bulk-in"},
             {"3:late", "needs a number: late=MILLISECONDS"},
             {"3:late=soon", "\"soon\" is no number"},
             {"3:stall=1", "stall takes no number"},
             {"1:stall; 2:oops", "\"2:oops\""},
         }) {
        EXPECT_THAT([text = text] { FaultPlan::Parse(text); },
                    testing::ThrowsMessage<std::invalid_argument>(testing::HasSubstr(explanation)));
    }
}

}  // namespace
}  // namespace Varnholt::Simulator
