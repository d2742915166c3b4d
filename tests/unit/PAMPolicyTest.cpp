// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMPolicy.h>

#include "GoldenFiles.h"
#include "SystemFileModels.h"

#include <gtest/gtest.h>

#include <random>
#include <sstream>
#include <string>
#include <vector>

using namespace SystemFileModels;

namespace {

std::string const Header = "#%PAM-1.0\n\n";

PAMPolicy Read(std::string const& text) {
    PAMPolicy policy("system-auth-generic");
    ReadPolicy(text, policy);
    return policy;
}

/// Pieces of which random policies are made: mostly sound lines, and everything that can go wrong.
std::vector<std::string> const Pieces = {
    "auth required pam_unix.so\n",
    "account\tsufficient\tpam_x.so a b\n",
    "session [success=1  default=ignore] pam_y.so # c\n",
    "password include other\n",
    "# comment\n",
    "\n",
    "\r\n",
    " ",
    "\t",
    "\v\f",
    "auth ",
    "session ",
    "requisite ",
    "[a ",
    "b] ",
    "substack m",
};

std::vector<std::string> const BadPieces = {
    "-auth", "@include x\n", "Required ", std::string(1, '\0'), "\xff", "[", "]", "#"};

TEST(PAMPolicyTest, GoldenFilesReadAndPrintAsExpected) {
    ExpectGoldenFiles<PAM>(20);
}

TEST(PAMPolicyTest, NameIsKept) {
    EXPECT_EQ(PAMPolicy("system-auth-generic").Name(), "system-auth-generic");
}

TEST(PAMPolicyTest, EmptyInputGivesAPolicyWithoutStacks) {
    EXPECT_TRUE(Read("").Stacks().empty());
    EXPECT_EQ(Normalised<PAM>(""), Header);
}

TEST(PAMPolicyTest, CommentsAndBlankLinesAloneGiveAPolicyWithoutStacks) {
    std::string const text = "#%PAM-1.0\n\n  # indented\n \t\r\n\v\f\n#last, without a line feed";
    EXPECT_TRUE(Read(text).Stacks().empty());
    EXPECT_EQ(Normalised<PAM>(text), Header);
}

TEST(PAMPolicyTest, StacksAreWrittenInTheOrderOfTheirNumbers) {
    EXPECT_EQ(Normalised<PAM>("session required s\npassword required p\nauth required u\n"
                              "account required a\n"),
              Header + "account\trequired\ta\t\n\nauth\trequired\tu\t\n\n"
                       "password\trequired\tp\t\n\nsession\trequired\ts\t\n\n");
}

TEST(PAMPolicyTest, CommentsAndSpacingAreNormalised) {
    EXPECT_EQ(Normalised<PAM>("# head\n\nauth   required\t \tm   a  b\n\n# tail\n"),
              Header + "auth\trequired\tm\ta b \n\n");
}

TEST(PAMPolicyTest, InterleavedGroupsAreSeparatedInTheirOwnOrder) {
    EXPECT_EQ(Normalised<PAM>("auth required 1\naccount required 2\nauth required 3\n"),
              Header + "account\trequired\t2\t\n\nauth\trequired\t1\t\nauth\trequired\t3\t\n\n");
}

TEST(PAMPolicyTest, AskingForAGroupMakesAnEmptyStackThatPrintsAsAnEmptyLine) {
    auto policy = Read("session required s\n");
    EXPECT_EQ(policy[PAMFacility::auth].Facility(), PAMFacility::auth);
    EXPECT_TRUE(policy[PAMFacility::auth].empty());
    std::ostringstream out;
    out << policy;
    EXPECT_EQ(out.str(), Header + "\nsession\trequired\ts\t\n\n");
}

TEST(PAMPolicyTest, LookingAtTheStacksMakesNone) {
    auto const policy = Read("session required s\n");
    EXPECT_EQ(policy.Stacks().count(PAMFacility::auth), 0u);
    EXPECT_EQ(policy.Stacks().size(), 1u);
}

TEST(PAMPolicyTest, FindOnAStackOfAFileReturnsTheFirstOfTwo) {
    auto policy = Read("auth required a\nauth optional m\nauth required m x\n");
    auto& stack = policy[PAMFacility::auth];
    EXPECT_EQ(stack.find("m") - stack.begin(), 1);
}

TEST(PAMPolicyTest, ReadingAppendsToTheStacksThereAre) {
    auto policy = Read("auth required 1\n");
    std::istringstream in("auth required 2\naccount required 3\n");
    in >> policy;
    ReadPolicy("auth required 4\n", policy);
    std::string out;
    PrintPolicy(policy, out);
    EXPECT_EQ(out, Header + "account\trequired\t3\t\n\n"
                            "auth\trequired\t1\t\nauth\trequired\t2\t\nauth\trequired\t4\t\n\n");
}

TEST(PAMPolicyTest, StreamEndsAtTheEndOfInputWithoutFailing) {
    std::istringstream in("auth required m\n# end\n");
    PAMPolicy policy("p");
    EXPECT_TRUE(in >> policy);
    EXPECT_TRUE(in.eof());
}

TEST(PAMPolicyTest, StreamThatIsNotGoodIsNotRead) {
    std::istringstream in("auth required m\n");
    in.setstate(std::ios::badbit);
    PAMPolicy policy("p");
    EXPECT_NO_THROW(in >> policy);
    EXPECT_TRUE(policy.Stacks().empty());
}

TEST(PAMPolicyTest, UnknownFacilityKeepsTheLinesBeforeAndLeavesTheStreamAfterTheWord) {
    std::istringstream in("auth required a\n-auth required b\naccount required c\n");
    PAMPolicy policy("p");
    EXPECT_EQ(Failure([&] { in >> policy; }), "InvalidFacilityException: Invalid Facility: -auth");
    EXPECT_EQ(Describe(policy), "2/2:\n  1{} {a} \n");
    std::string rest;
    std::getline(in, rest);
    EXPECT_EQ(rest, " required b");
}

TEST(PAMPolicyTest, UnknownControlKeepsTheLinesBeforeAndLeavesTheStreamAfterTheWord) {
    std::istringstream in("auth required a\naccount bogus b\n");
    PAMPolicy policy("p");
    EXPECT_EQ(Failure([&] { in >> policy; }), "InvalidControlException: Invalid Control: bogus");
    EXPECT_EQ(Describe(policy), "2/2:\n  1{} {a} \n");
    std::string rest;
    std::getline(in, rest);
    EXPECT_EQ(rest, " b");
}

TEST(PAMPolicyTest, LineCutShortByTheEndOfInputIsKeptWithItsMissingFieldsEmpty) {
    EXPECT_EQ(Describe(Read("auth required")), "2/2:\n  1{} {} \n");
    EXPECT_EQ(Describe(Read("auth required a\nauth")), "2/2:\n  1{} {a} \n  0{} {} \n");
    EXPECT_EQ(FromStream<PAM>("auth required"), FromText<PAM>("auth required"));
    EXPECT_EQ(FromStream<PAM>("auth \n"), FromText<PAM>("auth \n"));
}

TEST(PAMPolicyTest, ALoneFacilityAtTheEndCannotBePrinted) {
    // Not dropped in silence: a file that was cut there is not written back.
    EXPECT_EQ(Normalised<PAM>("auth required a\nauth"),
              "InvalidControlException: Invalid Control: ");
}

TEST(PAMPolicyTest, EntryWithoutControlThrowsAfterTheEarlierLinesWereWritten) {
    auto policy = Read("account required a\nauth required b\n");
    policy[PAMFacility::auth].push_back(PAMEntry());
    std::ostringstream out;
    EXPECT_EQ(Failure([&] { out << policy; }), "InvalidControlException: Invalid Control: ");
    EXPECT_EQ(out.str(), Header + "account\trequired\ta\t\n\nauth\trequired\tb\t\nauth\t");
}

TEST(PAMPolicyTest, LineOfAMebibyteIsRead) {
    std::string const argument(1 << 20, 'x');
    EXPECT_EQ(Normalised<PAM>("auth required m " + argument + "\n"),
              Header + "auth\trequired\tm\t" + argument + " \n\n");
    EXPECT_EQ(FromText<PAM>(argument), "InvalidFacilityException: Invalid Facility: " + argument);
    EXPECT_EQ(FromText<PAM>("#" + argument), "");
}

TEST(PAMPolicyTest, HundredThousandLinesAreReadInOrderBothWays) {
    std::string text;
    std::string expected = Header;
    for (int i = 0; i < 100000; ++i) {
        auto const number = std::to_string(i);
        text += "auth  required  m" + number + "  x\n";
        expected += "auth\trequired\tm" + number + "\tx \n";
    }
    expected += "\n";
    EXPECT_EQ(Normalised<PAM>(text), expected);
    EXPECT_EQ(NormalisedThroughStreams<PAM>(text), expected);
}

TEST(PAMPolicyTest, BothReadersAgreeOnRandomTexts) {
    std::mt19937 random(1);
    auto pieces = Pieces;
    pieces.insert(pieces.end(), Pieces.begin(), Pieces.end()); // so that most texts get far
    pieces.insert(pieces.end(), BadPieces.begin(), BadPieces.end());
    for (int i = 0; i < 20000; ++i) {
        auto const text = RandomText(random, pieces, random() % 12);
        ASSERT_EQ(FromText<PAM>(text), FromStream<PAM>(text)) << text;
    }
}

TEST(PAMPolicyTest, PrintingWhatWasReadIsIdempotent) {
    std::mt19937 random(2);
    int compared = 0;
    for (int i = 0; i < 20000; ++i) {
        auto const text = RandomText(random, Pieces, random() % 12) + "\n";
        PAMPolicy policy("p");
        bool whole = Failure([&] { ReadPolicy(text, policy); }).empty();
        for (auto const& [facility, stack] : policy.Stacks()) {
            for (auto const& entry : stack) {
                // A line that the input's end cut short takes its module from the next line when
                // it is read again.
                whole = whole && !entry.module().empty();
            }
        }
        if (!whole) {
            continue;
        }
        ++compared;
        auto const once = Normalised<PAM>(text);
        ASSERT_EQ(Normalised<PAM>(once), once) << text;
        ASSERT_EQ(FromText<PAM>(once), FromText<PAM>(text)) << text;
    }
    EXPECT_GT(compared, 1000);
}

TEST(PAMPolicyTest, ReadingKeepsTheOrderWithinEachGroup) {
    std::mt19937 random(3);
    char const* const words[] = {"account", "auth", "password", "session"};
    for (int i = 0; i < 200; ++i) {
        std::string text;
        std::string groups[4];
        for (auto line = random() % 50; line > 0; --line) {
            auto const group = random() % 4;
            text += std::string(words[group]) + " required m" + std::to_string(line) + "\n";
            groups[group] +=
                std::string(words[group]) + "\trequired\tm" + std::to_string(line) + "\t\n";
        }
        std::string expected = Header;
        for (auto const& group : groups) {
            expected += group.empty() ? "" : group + "\n";
        }
        ASSERT_EQ(Normalised<PAM>(text), expected);
    }
}

} // namespace
