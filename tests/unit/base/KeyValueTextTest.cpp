// SPDX-License-Identifier: Apache-2.0
#include <base/KeyValueText.h>

#include <gtest/gtest.h>
#include <string>
#include <utility>
#include <vector>

namespace tessel::base {
namespace {

using Assignments = std::vector<std::pair<std::string, std::string>>;

Assignments AssignmentsOf(std::string const& text) {
    Assignments assignments;
    ForEachAssignment(text, [&](Assignment const& assignment) {
        assignments.emplace_back(assignment.key, assignment.value);
    });
    return assignments;
}

std::string FailureOf(std::string const& text) {
    try {
        AssignmentsOf(text);
    } catch (KeyValueError const& error) {
        return error.what();
    }
    return "(none)";
}

TEST(KeyValueTextTest, AssignmentsAreReadWithoutBlanksAndQuotes) {
    EXPECT_EQ((Assignments{{"a", "1"}, {"b", " x "}, {"c", "y z"}, {"d", "'"}, {"e f", "\""}}),
              AssignmentsOf("a = \"1\"\n\n \t\nb=' x '\n\tc\t=  y z \t\nd = \"'\"\n'e f'='\"'"));
}

TEST(KeyValueTextTest, OnlyTheFirstDelimiterSplits) {
    EXPECT_EQ((Assignments{{"a", "b = c"}}), AssignmentsOf("a = \"b = c\"\n"));
}

TEST(KeyValueTextTest, EveryAssignmentOfAKeyIsTold) {
    EXPECT_EQ((Assignments{{"a", "1"}, {"a", "2"}}), AssignmentsOf("a = 1\na = 2\n"));
}

TEST(KeyValueTextTest, QuotesAtOneEndAndOfTwoKindsStay) {
    EXPECT_EQ((Assignments{{"a", "\"1"}, {"b", "1\""}, {"c", "\"1'"}}),
              AssignmentsOf("a = \"1\nb = 1\"\nc = \"1'\n"));
}

TEST(KeyValueTextTest, EmptyAndBlankFieldsStayAsTheyAre) {
    EXPECT_EQ((Assignments{{"a", ""}, {"b", "   "}, {"c", ""}, {"", "x"}}),
              AssignmentsOf("a = \"\"\nb =   \nc =\n=x\n"));
}

TEST(KeyValueTextTest, ThereAreNoComments) {
    EXPECT_EQ((Assignments{{"# a", "1 # x"}}), AssignmentsOf("# a = 1 # x\n"));
    EXPECT_EQ("Error parsing configuration on line 2: no delimiter found",
              FailureOf("\n# comment\n"));
}

TEST(KeyValueTextTest, ACarriageReturnIsPartOfTheValue) {
    EXPECT_EQ((Assignments{{"a", "\"1\"\r"}}), AssignmentsOf("a = \"1\"\r\n"));
    EXPECT_EQ("Error parsing configuration on line 1: no delimiter found", FailureOf("\r\n"));
}

TEST(KeyValueTextTest, ALoneQuoteIsAnError) {
    for (char const* const line : {"a = \"", "a = '", "\" = 1", " ' = 1"}) {
        EXPECT_EQ("Error parsing configuration at line 3: invalid quoting",
                  FailureOf(std::string("x = 1\n\n") + line));
    }
}

TEST(KeyValueTextTest, AHundredThousandLinesAreRead) {
    std::string text;
    for (int i = 0; i < 100000; ++i) {
        text += "key" + std::to_string(i) + " = \"" + std::to_string(i) + "\"\n";
    }
    Assignments const assignments = AssignmentsOf(text);
    EXPECT_EQ(100000U, assignments.size());
    EXPECT_EQ("99999", assignments.back().second);
}

} // namespace
} // namespace tessel::base
