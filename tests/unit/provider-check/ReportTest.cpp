// SPDX-License-Identifier: Apache-2.0
#include "Report.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>

using namespace tessel::providercheck;
using testing::HasSubstr;
using testing::Not;

TEST(ReportTest, ARuleThatNothingWasLookedAtForIsSkippedWithItsReason) {
    Report report;
    report.NotExamined(Rule::Joins, "there is no directory");
    EXPECT_TRUE(report.Passes());
    EXPECT_THAT(report.Tap(), HasSubstr("for every process # SKIP there is no directory\n"));
    EXPECT_THAT(report.JUnit("p"), HasSubstr("<skipped message=\"there is no directory\"/>"));
}

TEST(ReportTest, ARuleThatWasLookedAtPasses) {
    Report report;
    report.NotExamined(Rule::Loads, "a reason that does not count");
    report.Examined(Rule::Loads);
    EXPECT_THAT(report.Tap(), HasSubstr("TAP version 14\n1..34\nok 1 - loads: "));
    EXPECT_THAT(report.Tap(), Not(HasSubstr("a reason that does not count")));
}

TEST(ReportTest, AFindingFailsItsRuleAndSaysWhy) {
    Report report;
    report.Examined(Rule::Loads);
    report.Found(Rule::Loads, "what was seen");
    report.Found(Rule::Loads, "what was seen");
    EXPECT_FALSE(report.Passes());
    EXPECT_THAT(report.Tap(), HasSubstr("not ok 1 - loads: "));
    EXPECT_THAT(report.Tap(), HasSubstr("\n  ---\n  why: \"it is opened whenever"));
    EXPECT_THAT(report.Tap(), HasSubstr("\n  found:\n    - \"what was seen\"\n  ...\nok 2 - "));
    EXPECT_THAT(report.JUnit("p"), HasSubstr("failures=\"1\""));
}

TEST(ReportTest, WhatAProviderSaysIsQuoted) {
    Report report;
    report.Found(Rule::Output, "a \"b\" \\ <c> & \n\xff");
    EXPECT_THAT(report.Tap(), HasSubstr("- \"a \\\"b\\\" \\\\ <c> & \\x0a\\xff\"\n"));
    EXPECT_THAT(report.JUnit("<p>"), HasSubstr("a &quot;b&quot; \\ &lt;c&gt; &amp; ??\n"));
    EXPECT_THAT(report.JUnit("<p>"), HasSubstr("<testsuite name=\"&lt;p&gt;\""));
}

TEST(ReportTest, EveryRuleHasANameOfItsOwn) {
    std::set<std::string> names;
    for (std::size_t i = 0; i < RuleCount; ++i) {
        names.insert(TextOf(static_cast<Rule>(i)).name);
    }
    EXPECT_EQ(RuleCount, names.size());
}
