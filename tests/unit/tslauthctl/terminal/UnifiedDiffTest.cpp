// SPDX-License-Identifier: Apache-2.0
#include "terminal/UnifiedDiff.h"

#include <base/AsciiText.h>
#include <gtest/gtest.h>

#include <random>
#include <string>

namespace tessel::tslauthctl {
namespace {

/// Applies a difference the way patch(1) does, but without any leeway: every line of the old text
/// that the difference shows must stand exactly where it says.
std::string Apply(std::string_view before, std::string_view diff) {
    auto const old = base::AsciiText::Lines(before);
    auto const steps = base::AsciiText::Lines(diff);
    std::string out;
    std::size_t next = 0;
    for (std::size_t i = 2; i < steps.size();) {
        std::size_t start = 0;
        std::size_t count = 0;
        if (std::sscanf(std::string(steps[i]).c_str(), "@@ -%zu,%zu", &start, &count) != 2) {
            ADD_FAILURE() << "no range: " << steps[i];
            return out;
        }
        auto const from = count > 0 ? start - 1 : start;
        for (; next < from; ++next) {
            out += old.at(next);
        }
        for (++i; i < steps.size() && steps[i].front() != '@'; ++i) {
            auto line = steps[i].substr(1);
            bool const cut = i + 1 < steps.size() && steps[i + 1].front() == '\\';
            if (cut) {
                line.remove_suffix(1);
            }
            if (steps[i].front() != '+') {
                EXPECT_EQ(old.at(next++), line);
            }
            if (steps[i].front() != '-') {
                out += line;
            }
            i += cut ? 1 : 0;
        }
    }
    for (; next < old.size(); ++next) {
        out += old[next];
    }
    return out;
}

TEST(UnifiedDiffTest, EqualTextsHaveNone) {
    EXPECT_EQ("", UnifiedDiff("f", "a\n", "a\n"));
    EXPECT_EQ("", UnifiedDiff("f", "", ""));
}

TEST(UnifiedDiffTest, AChangeHasThreeLinesAroundIt) {
    EXPECT_EQ("--- f\n+++ f\n@@ -2,7 +2,7 @@\n 2\n 3\n 4\n-5\n+five\n 6\n 7\n 8\n",
              UnifiedDiff("f", "1\n2\n3\n4\n5\n6\n7\n8\n9\n", "1\n2\n3\n4\nfive\n6\n7\n8\n9\n"));
}

TEST(UnifiedDiffTest, AnEmptyFileIsNamedByLineZero) {
    EXPECT_EQ("--- f\n+++ f\n@@ -0,0 +1,1 @@\n+a\n", UnifiedDiff("f", "", "a\n"));
    EXPECT_EQ("--- f\n+++ f\n@@ -1,1 +0,0 @@\n-a\n", UnifiedDiff("f", "a\n", ""));
}

TEST(UnifiedDiffTest, AMissingLastLineFeedIsTold) {
    EXPECT_EQ("--- f\n+++ f\n@@ -1,1 +1,1 @@\n-a\n\\ No newline at end of file\n+a\n",
              UnifiedDiff("f", "a", "a\n"));
}

TEST(UnifiedDiffTest, WhatGoesStandsBeforeWhatComes) {
    EXPECT_EQ("--- f\n+++ f\n@@ -1,4 +1,5 @@\n 0\n-a\n-b\n+x\n+y\n+z\n 1\n",
              UnifiedDiff("f", "0\na\nb\n1\n", "0\nx\ny\nz\n1\n"));
}

TEST(UnifiedDiffTest, DistantChangesAreHunksOfTheirOwn) {
    std::string before;
    for (int i = 0; i < 20; ++i) {
        before += std::to_string(i) + "\n";
    }
    auto after = before;
    after.replace(0, 1, "x");
    after.replace(after.size() - 3, 2, "yy");
    auto const diff = UnifiedDiff("f", before, after);
    EXPECT_EQ(after, Apply(before, diff));
    EXPECT_NE(std::string::npos, diff.find("@@ -1,4 +1,4 @@"));
    EXPECT_NE(std::string::npos, diff.find("@@ -17,4 +17,4 @@"));
}

TEST(UnifiedDiffTest, ApplyingItGivesTheTextAfter) {
    std::mt19937 random(1);
    auto const text = [&random] {
        std::string out;
        for (auto lines = random() % 40; lines > 0; --lines) {
            out += static_cast<char>('a' + random() % 4);
            out += '\n';
        }
        if (!out.empty() && random() % 3 == 0) {
            out.pop_back();
        }
        return out;
    };
    for (int i = 0; i < 100; ++i) {
        auto const before = text();
        auto const after = text();
        if (before != after) {
            ASSERT_EQ(after, Apply(before, UnifiedDiff("f", before, after)))
                << "before:\n"
                << before << "\nafter:\n"
                << after;
        }
    }
}

TEST(UnifiedDiffTest, AHugeChangeIsStillADifference) {
    std::string before;
    std::string after;
    for (int i = 0; i < 20000; ++i) {
        before += "a" + std::to_string(i) + "\n";
        after += "b" + std::to_string(i) + "\n";
    }
    EXPECT_EQ(after, Apply(before, UnifiedDiff("f", before, after)));
}

} // namespace
} // namespace tessel::tslauthctl
