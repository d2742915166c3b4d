// SPDX-License-Identifier: Apache-2.0
#include "KeyValueText.h"

#include "HostCtlFailure.h"

#include <gtest/gtest.h>
#include <map>
#include <string>

namespace StrandCtl {
namespace {

using Assignments = std::map<std::string, std::string>;

TEST(KeyValueTextTest, AssignmentsAreReadWithoutBlanksAndQuotes) {
    EXPECT_EQ(
        (Assignments{{"a", "1"}, {"b", " x "}, {"c", "y z"}, {"d", "'"}, {"e f", "\""}}),
        ParseKeyValueText("a = \"1\"\n\n \t\nb=' x '\n\tc\t=  y z \t\nd = \"'\"\n'e f'='\"'"));
}

TEST(KeyValueTextTest, OnlyTheFirstDelimiterSplits) {
    EXPECT_EQ((Assignments{{"a", "b = c"}}), ParseKeyValueText("a = \"b = c\"\n"));
}

TEST(KeyValueTextTest, TheFirstAssignmentOfAKeyCounts) {
    EXPECT_EQ((Assignments{{"a", "1"}}), ParseKeyValueText("a = 1\na = 2\n"));
}

TEST(KeyValueTextTest, QuotesAtOneEndAndOfTwoKindsStay) {
    EXPECT_EQ((Assignments{{"a", "\"1"}, {"b", "1\""}, {"c", "\"1'"}}),
              ParseKeyValueText("a = \"1\nb = 1\"\nc = \"1'\n"));
}

TEST(KeyValueTextTest, EmptyAndBlankFieldsStayAsTheyAre) {
    EXPECT_EQ((Assignments{{"a", ""}, {"b", "   "}, {"c", ""}, {"", "x"}}),
              ParseKeyValueText("a = \"\"\nb =   \nc =\n=x\n"));
}

TEST(KeyValueTextTest, ThereAreNoComments) {
    EXPECT_EQ((Assignments{{"# a", "1 # x"}}), ParseKeyValueText("# a = 1 # x\n"));
    EXPECT_EQ("Error parsing configuration on line 2: no delimiter found",
              FailureOf([] { ParseKeyValueText("\n# comment\n"); }));
}

TEST(KeyValueTextTest, ACarriageReturnIsPartOfTheValue) {
    EXPECT_EQ((Assignments{{"a", "\"1\"\r"}}), ParseKeyValueText("a = \"1\"\r\n"));
    EXPECT_EQ("Error parsing configuration on line 1: no delimiter found",
              FailureOf([] { ParseKeyValueText("\r\n"); }));
}

TEST(KeyValueTextTest, ALoneQuoteIsAnError) {
    for (char const* const line : {"a = \"", "a = '", "\" = 1", " ' = 1"}) {
        EXPECT_EQ("Error parsing configuration at line 3: invalid quoting",
                  FailureOf([&] { ParseKeyValueText(std::string("x = 1\n\n") + line); }));
    }
}

TEST(KeyValueTextTest, AHundredThousandLinesAreRead) {
    std::string text;
    for (int i = 0; i < 100000; ++i) {
        text += "key" + std::to_string(i) + " = \"" + std::to_string(i) + "\"\n";
    }
    Assignments const assignments = ParseKeyValueText(text);
    EXPECT_EQ(100000U, assignments.size());
    EXPECT_EQ("99999", assignments.at("key99999"));
}

} // namespace
} // namespace StrandCtl
