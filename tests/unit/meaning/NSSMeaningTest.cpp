// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>

#include <meaning/NSSMeaning.h>

namespace tessel::meaning {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

std::string Services(std::string_view line) {
    auto const read = ReadNSSLine(line);
    return read ? read->database + "=" + NSSText(read->services) : "(none)";
}

TEST(NSSMeaningTest, SpacingDoesNotMatter) {
    EXPECT_EQ("passwd=files dns", Services("  passwd:\t files \t dns \r\n"));
    EXPECT_EQ("passwd=files", Services("passwd:files"));
    EXPECT_EQ("passwd=files", Services("passwd files"));
    EXPECT_EQ("passwd=files", Services("passwd : files"));
    EXPECT_EQ("passwd=", Services("passwd:"));
}

TEST(NSSMeaningTest, ALineWithoutASeparatorMeansNothing) {
    EXPECT_EQ("(none)", Services("passwd\n"));
    EXPECT_EQ("(none)", Services(": files"));
    EXPECT_EQ("(none)", Services(" \t\n"));
}

TEST(NSSMeaningTest, ACommentBeginsOnlyAtTheStartOfALine) {
    EXPECT_EQ("(none)", Services("# passwd: files"));
    EXPECT_EQ("(none)", Services("  # passwd: files"));
    EXPECT_EQ("passwd=files # dns", Services("passwd: files # dns"));
}

TEST(NSSMeaningTest, ABracketNeedsNoBlanks) {
    EXPECT_EQ("hosts=files [NOTFOUND=return] dns", Services("hosts: files[NOTFOUND=return]dns"));
    EXPECT_EQ("hosts=files [NOTFOUND=return] dns",
              Services("hosts: files [ notfound = RETURN ] dns"));
    EXPECT_EQ("hosts=files dns", Services("hosts: files[SUCCESS=return]dns"));
}

TEST(NSSMeaningTest, AnExclamationMarkMeansAllTheOthers) {
    auto const line = ReadNSSLine("hosts: files [!SUCCESS=return] dns");
    ASSERT_TRUE(line);
    EXPECT_EQ((NSSActions{NSSAction::leave, NSSAction::leave, NSSAction::leave, NSSAction::leave}),
              line->services.at(0).actions);
    // What was said before for the one that is left out stays.
    auto const kept = ReadNSSLine("hosts: files [NOTFOUND=merge !NOTFOUND=return]");
    ASSERT_TRUE(kept);
    EXPECT_EQ(NSSAction::merge, kept->services.at(0).actions[1]);
}

TEST(NSSMeaningTest, ASecondBracketEndsTheList) {
    auto const line = ReadNSSLine("passwd: files [SUCCESS=return] [NOTFOUND=return] dns");
    ASSERT_TRUE(line);
    EXPECT_EQ("files", NSSText(line->services));
    EXPECT_TRUE(line->unreadRest);
    EXPECT_EQ("passwd=", Services("passwd: [NOTFOUND=return] files"));
}

TEST(NSSMeaningTest, ACriterionThatIsNotUnderstoodIsAFault) {
    for (auto const* text : {"passwd: files [FOO=return] dns", "passwd: files [NOTFOUND=return dns",
                             "passwd: files []", "passwd: files [! SUCCESS=return]",
                             "passwd: files [NOTFOUND=return,UNAVAIL=return]", "passwd: files ["}) {
        auto const line = ReadNSSLine(text);
        ASSERT_TRUE(line) << text;
        EXPECT_TRUE(line->faulty) << text;
    }
    EXPECT_THAT(ReadNSSMeaning("hosts: dns\npasswd: files []\n").faultyLines, ElementsAre(2));
}

TEST(NSSMeaningTest, OfTwoLinesTheLastApplies) {
    auto const meaning = ReadNSSMeaning("passwd: files\n# one\npasswd: dns");
    EXPECT_EQ("dns", NSSText(meaning.databases.at("passwd")));
    EXPECT_EQ(1U, meaning.comments);
}

TEST(NSSMeaningTest, ANULByteEndsALine) {
    EXPECT_EQ("passwd=files", Services(std::string_view("passwd: files\0 dns", 18)));
}

TEST(NSSMeaningTest, WithoutALineTheDefaultHolds) {
    auto const meaning = ReadNSSMeaning("passwd:\n");
    EXPECT_THAT(*EffectiveNSSServices(meaning, "passwd"), IsEmpty());
    EXPECT_EQ("files", NSSText(*EffectiveNSSServices(meaning, "shadow")));
    EXPECT_EQ("files dns", NSSText(*EffectiveNSSServices(meaning, "hosts")));
    EXPECT_FALSE(EffectiveNSSServices(meaning, "automount"));
}

TEST(NSSMeaningTest, EveryCombinationOfReturnsIsOneCriterion) {
    for (unsigned set = 0; set < 8; ++set) {
        auto actions = DefaultNSSActions;
        for (std::size_t i = 0; i < 3; ++i) {
            actions[i + 1] = (set >> i & 1U) != 0 ? NSSAction::leave : NSSAction::proceed;
        }
        auto const text = OneCriterion(actions);
        ASSERT_TRUE(text) << set;
        auto const line = ReadNSSLine("passwd: x" + *text);
        ASSERT_TRUE(line);
        EXPECT_EQ(actions, line->services.at(0).actions) << *text;
    }
}

TEST(NSSMeaningTest, TheLastServicesActionsMakeNoDifferenceUnlessTheyMerge) {
    auto const services = [](std::string_view line) { return ReadNSSLine(line)->services; };
    EXPECT_TRUE(SameEffect(services("x: a b [NOTFOUND=return]"), services("x: a b")));
    EXPECT_FALSE(SameEffect(services("x: a [NOTFOUND=return] b"), services("x: a b")));
    EXPECT_FALSE(SameEffect(services("x: a [SUCCESS=merge]"), services("x: a")));
}

} // namespace
} // namespace tessel::meaning
