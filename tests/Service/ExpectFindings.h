#pragma once

#include <gmock/gmock.h>

#include <optional>
#include <string>
#include <vector>

#include "Service/Finding.h"

namespace Varnholt::Tests {

/// What the doctor finds: a letter for each (good, note, problem), and of the last one what its texts and its
/// fix hold; an empty fix: it has none.
inline void ExpectFindings(const std::vector<Service::Finding>& findings, const std::string& levels,
                           const char* text, const std::string& fix,
                           std::optional<Service::FailureKind> failure) {
    std::string found;
    for (const Service::Finding& finding : findings) {
        found += finding.level == Service::Finding::Level::Good   ? 'g'
                 : finding.level == Service::Finding::Level::Note ? 'n'
                                                                  : 'p';
    }
    ASSERT_EQ(found, levels);
    const Service::Finding& last = findings.back();
    EXPECT_THAT(last.subject + " " + last.text, testing::HasSubstr(text));
    EXPECT_THAT(last.fix, testing::HasSubstr(fix));
    EXPECT_EQ(last.fix.empty(), fix.empty()) << last.fix;
    EXPECT_EQ(last.failure, failure);
}

}  // namespace Varnholt::Tests
