// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>

#include <meaning/PAMMeaning.h>

namespace tessel::meaning {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

/// The lines as text with single blanks.
std::vector<std::string> Read(std::string_view text) {
    std::vector<std::string> lines;
    for (auto const& line : ReadPAMMeaning(text).lines) {
        lines.push_back(PAMText(line));
        for (char& c : lines.back()) {
            c = c == '\t' ? ' ' : c;
        }
    }
    return lines;
}

std::optional<std::string> NoPolicy(std::string const&) {
    return std::nullopt;
}

TEST(PAMMeaningTest, CaseOfFacilityAndControlDoesNotMatter) {
    EXPECT_THAT(Read("AUTH Required pam_X.so Arg\n@Include Y\n"),
                ElementsAre("auth required pam_X.so Arg", "@include Y"));
}

TEST(PAMMeaningTest, ACommentBeginsAnywhere) {
    EXPECT_THAT(Read("auth required a.so # x\n#auth required b.so\nauth required c.so#d\n"),
                ElementsAre("auth required a.so", "auth required c.so"));
    EXPECT_EQ(3U, ReadPAMMeaning("auth required a.so # x\n # y\n# z").comments);
}

TEST(PAMMeaningTest, ABackslashJoinsTheNextLineThatIsNoComment) {
    auto const meaning =
        ReadPAMMeaning("auth required \\\n# no\n\n  a.so x\\\ny\nauth required b.so\n");
    ASSERT_THAT(meaning.lines, SizeIs(2));
    EXPECT_EQ("auth\trequired\ta.so\tx y", PAMText(meaning.lines[0]));
    EXPECT_EQ(1U, meaning.lines[0].first);
    EXPECT_EQ(5U, meaning.lines[0].last);
    EXPECT_EQ(6U, meaning.lines[1].first);
    // Behind a comment it joins nothing.
    EXPECT_THAT(Read("auth required a.so # \\\nauth required b.so\n"), SizeIs(2));
}

TEST(PAMMeaningTest, AContinuationAtTheEndMakesTheFileUnreadable) {
    EXPECT_TRUE(ReadPAMMeaning("auth required a.so \\\n").unreadable);
    EXPECT_TRUE(ReadPAMMeaning("auth required a.so \\").unreadable);
    EXPECT_FALSE(ReadPAMMeaning("auth required a.so").unreadable);
}

TEST(PAMMeaningTest, BracketsHoldBlanksTogether) {
    EXPECT_THAT(Read("auth [ success = 1   default=bad ]a.so [x  y] [z] [a\\]b]\n"),
                ElementsAre("auth [success=1 default=bad] a.so [x  y] z a]b"));
}

TEST(PAMMeaningTest, TheMinusIsKeptApart) {
    auto const meaning = ReadPAMMeaning("-session optional a.so\n");
    ASSERT_THAT(meaning.lines, SizeIs(1));
    EXPECT_TRUE(meaning.lines[0].silent);
    EXPECT_EQ("session", meaning.lines[0].facility);
}

TEST(PAMMeaningTest, OnlySpaceAndTabSeparate) {
    EXPECT_THAT(Read("auth required a.so\r\n"), ElementsAre("auth required a.so\r"));
    EXPECT_FALSE(ReadPAMMeaning("\vauth required a.so\n").lines.at(0).known);
}

TEST(PAMMeaningTest, ALongLineIsReadInPieces) {
    auto const meaning = ReadPAMMeaning("#" + std::string(1022, 'x') + "auth required a.so\n");
    ASSERT_THAT(meaning.lines, SizeIs(1));
    EXPECT_EQ("auth", meaning.lines[0].facility);
    EXPECT_THAT(Read("#" + std::string(1021, 'x') + "auth required a.so\n"), SizeIs(1));
    EXPECT_THAT(Read("#" + std::string(900, 'x') + "auth required a.so\n"), IsEmpty());
}

TEST(PAMMeaningTest, ANULByteEndsALine) {
    using namespace std::string_literals;
    EXPECT_THAT(Read("\0auth required a.so\nauth required b.so\0c\n"s),
                ElementsAre("auth required b.so"));
}

TEST(PAMMeaningTest, AStackHoldsTheIncludesOfAll) {
    auto const meaning = ReadPAMMeaning("auth required a.so\n@include x\naccount required b.so\n");
    EXPECT_THAT(PAMStackOf(meaning, "auth"), SizeIs(2));
    EXPECT_EQ("include", PAMStackOf(meaning, "session").at(0).control);
}

TEST(PAMMeaningTest, AJumpCountsTheModulesOfAnInclude) {
    auto const stack = PAMStackOf(
        ReadPAMMeaning(
            "auth [success=3 default=ignore] a.so\nauth include two\nauth required b.so\n"
            "auth required c.so\n"),
        "auth");
    auto const two = [](std::string const& name) {
        return name == "two"
                   ? std::optional<std::string>("auth required x.so\nauth required y.so\n")
                   : std::nullopt;
    };
    auto const jumps = PAMJumps(stack, two);
    ASSERT_THAT(jumps, SizeIs(1));
    EXPECT_EQ("success=3", jumps[0].criterion);
    EXPECT_EQ(3U, jumps[0].to);
    EXPECT_FALSE(PAMJumps(stack, NoPolicy).at(0).to);
}

TEST(PAMMeaningTest, AJumpCountsASubstackAsOne) {
    auto const stack = PAMStackOf(
        ReadPAMMeaning(
            "auth [success=1 default=ignore] a.so\nauth substack two\nauth required b.so\n"),
        "auth");
    EXPECT_EQ(2U, PAMJumps(stack, NoPolicy).at(0).to);
}

TEST(PAMMeaningTest, AJumpOutOfAnIncludeGoesOnBehindIt) {
    auto const stack = PAMStackOf(
        ReadPAMMeaning("auth include one\nauth required b.so\nauth required c.so\n"), "auth");
    auto const one = [](std::string const&) {
        return std::optional<std::string>("auth [success=1 default=ignore] x.so\n");
    };
    auto const jumps = PAMJumps(stack, one);
    ASSERT_THAT(jumps, SizeIs(1));
    EXPECT_EQ(0U, jumps[0].from);
    EXPECT_EQ(2U, jumps[0].to);
}

TEST(PAMMeaningTest, AnIncludeOfItselfEnds) {
    auto const stack = PAMStackOf(ReadPAMMeaning("auth include self\n"), "auth");
    auto const self = [](std::string const&) {
        return std::optional<std::string>(
            "auth [success=1 default=ignore] x.so\nauth include self\n");
    };
    EXPECT_FALSE(PAMJumps(stack, self).empty());
}

} // namespace
} // namespace tessel::meaning
