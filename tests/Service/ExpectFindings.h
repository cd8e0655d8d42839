#pragma once

#include <gmock/gmock.h>

#include <optional>
#include <string>
#include <vector>

#include "Service/Finding.h"

namespace Varnholt::Tests {

/// What the doctor finds: a letter for each (good, note, problem), what their texts hold, and of the last one
/// what its fix holds; an empty fix: it has none.
inline void ExpectFindings(const std::vector<Service::Finding>& findings, const std::string& levels,
                           const char* text, const std::string& fix,
                           std::optional<Service::FailureKind> failure) {
    std::string found, told;
    for (const Service::Finding& finding : findings) {
        found += finding.level == Service::Finding::Level::Good   ? 'g'
                 : finding.level == Service::Finding::Level::Note ? 'n'
                                                                  : 'p';
        told += finding.subject + " " + finding.text + "\n";
        EXPECT_EQ(finding.failure.has_value(), found.back() == 'p');
    }
    ASSERT_EQ(found, levels);
    const Service::Finding& last = findings.back();
    EXPECT_THAT(told, testing::HasSubstr(text));
    EXPECT_THAT(last.fix, testing::HasSubstr(fix));
    EXPECT_EQ(last.fix.empty(), fix.empty()) << last.fix;
    EXPECT_EQ(last.failure, failure);
}

}  // namespace Varnholt::Tests
